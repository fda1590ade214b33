// Secrets are kept in one buffer, which is wiped, and while there is any no core file is written.

#include "backends/posix/SecretText.h"

#include <gtest/gtest.h>

#include <optional>
#include <stdexcept>
#include <sys/prctl.h>

namespace welcomer::posix {
namespace {

class SecretTextTest : public testing::Test {
  protected:
    SecretTextTest() { ::prctl(PR_SET_DUMPABLE, 1); }

    static bool isDumpable() { return ::prctl(PR_GET_DUMPABLE) == 1; }
};

TEST_F(SecretTextTest, NoCoreFileIsWrittenWhileThereIsAny) {
    EXPECT_TRUE(isDumpable());
    std::optional<SecretText> one(std::in_place, "one");
    EXPECT_FALSE(isDumpable());
    std::optional<SecretText> other(std::in_place, "other");
    one.reset();
    EXPECT_FALSE(isDumpable());
    other.reset();
    EXPECT_TRUE(isDumpable());
}

TEST_F(SecretTextTest, WhatIsMadeFromTheTextOfAnotherSharesItsBuffer) {
    for (const std::string text : {"short", "longer than what a text has room for in itself"}) {
        std::optional<SecretText> one(std::in_place, text);
        EXPECT_NE(one->text().data(), text.data());
        const SecretText other(one->text());
        EXPECT_EQ(other.text().data(), one->text().data());
        const SecretText begin(std::string_view(one->text()).substr(0, 3));
        EXPECT_NE(begin.text().data(), one->text().data());
        one.reset();
        EXPECT_EQ(other.text(), text);
        EXPECT_FALSE(isDumpable());
    }
    EXPECT_TRUE(isDumpable());
}

TEST_F(SecretTextTest, WhatIsReadStandsWhereItIsRead) {
    const char* place = nullptr;
    const SecretText secret(100, [&](std::string& text) {
        EXPECT_FALSE(isDumpable());
        place = text.data();
        text.append(60, 'x');
        text.append(40, 'y');
    });
    EXPECT_EQ(secret.text(), std::string(60, 'x') + std::string(40, 'y'));
    EXPECT_EQ(secret.text().data(), place);
}

TEST_F(SecretTextTest, WhatCannotBeReadLeavesNothing) {
    EXPECT_THROW(SecretText(10, [](std::string&) { throw std::runtime_error("no"); }), std::runtime_error);
    EXPECT_TRUE(isDumpable());
}

TEST_F(SecretTextTest, WhatIsWipedIsZeroUpToItsCapacity) {
    std::string text(100, 'x');
    text.reserve(200);
    const char* const place = text.data();
    text.resize(10);
    wipe(text);
    EXPECT_EQ(text, "");
    EXPECT_EQ(std::string(place, 100), std::string(100, '\0'));
}

} // namespace
} // namespace welcomer::posix
