#include "platform/NetworkConfigStore.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <set>
#include <string>

namespace welcomer::platform {

TEST(NetworkConfigStatusTest, EveryCodeHasATextOfItsOwn) {
    std::set<std::string> texts;
    for (std::int32_t code = 0; code <= kNetworkConfigNameServiceSilent; ++code) {
        const std::string text = networkConfigStatusText(code);
        EXPECT_FALSE(text.starts_with("error ")) << code;
        texts.insert(text);
    }
    EXPECT_EQ(texts.size(), 16U);
}

TEST(NetworkConfigStatusTest, WhatTheKernelRefusedIsSaidInItsWords) {
    EXPECT_EQ(networkConfigStatusText(kNetworkConfigKernelRefused + EEXIST),
              "the kernel refused: File exists");
}

TEST(NetworkConfigStatusTest, AnotherCodeIsItsNumber) {
    EXPECT_EQ(networkConfigStatusText(-7), "error -7");
    EXPECT_EQ(networkConfigStatusText(kNetworkConfigKernelRefused), "error 1000");
}

} // namespace welcomer::platform
