#include "tools/launch-agents/UserManagerStarter.h"

#include "tests/contract/TemporaryRoot.h"

#include <cstdlib>
#include <gtest/gtest.h>

namespace welcomer::launch {
namespace {

TEST(UserManagerStarter, AUnitIsNamedAfterTheLabel) {
    EXPECT_EQ(unitName("com.corvid.welcomer.nimbussetup.user"),
              "welcomer-agent-com.corvid.welcomer.nimbussetup.user.service");
}

TEST(UserManagerStarter, WhatAUnitsNameCannotHoldIsWrittenAsItsBytes) {
    EXPECT_EQ(unitName("a b/@\\\xc3\xa9-:_"), "welcomer-agent-a\\x20b\\x2f\\x40\\x5c\\xc3\\xa9-:_.service");
}

TEST(UserManagerStarter, ThereIsNoneWithoutABus) {
    const TemporaryRoot root;
    ::setenv("DBUS_SESSION_BUS_ADDRESS", ("unix:path=" + root.path() + "/none").c_str(), 1);
    EXPECT_EQ(UserManagerStarter::connect(root.path()), nullptr);
    EXPECT_EQ(UserManagerStarter::connect(""), nullptr);
}

} // namespace
} // namespace welcomer::launch
