#include "backends/local/accounts/PasswordHash.h"

#include <gtest/gtest.h>

#include <string>

namespace welcomer {
namespace {

TEST(PasswordHashTest, AHashMatchesItsPasswordAloneAndIsYescrypt) {
    const std::string hash = local::makePasswordHash("secret").value();
    EXPECT_TRUE(hash.starts_with("$y$"));
    EXPECT_TRUE(local::passwordMatches("secret", hash));
    EXPECT_FALSE(local::passwordMatches("secret ", hash));
    EXPECT_FALSE(local::passwordMatches("", hash));
    EXPECT_FALSE(local::passwordMatches("secret", ""));
    EXPECT_FALSE(local::passwordMatches("secret", hash + "x"));
}

TEST(PasswordHashTest, EveryHashHasASaltOfItsOwn) {
    EXPECT_NE(local::makePasswordHash("secret"), local::makePasswordHash("secret"));
}

TEST(PasswordHashTest, APasswordWithANULHasNoHash) {
    EXPECT_EQ(local::makePasswordHash(std::string("a\0b", 3)), std::nullopt);
}

TEST(PasswordHashTest, TheSystemsOtherHashesMatchToo) {
    // "secret" in SHA-512, as many systems keep it.
    const std::string hash =
        "$6$saltsalt$TVLlQcbpFVof5W3Yz4DTP6gRstiNuHwwTt6GLc1E5n0U0aDehy0S5knV8wiOQSpT0Y77vwPZN.Pq.H91p5hVO1";
    EXPECT_TRUE(local::passwordMatches("secret", hash));
    EXPECT_FALSE(local::passwordMatches("other", hash));
}

} // namespace
} // namespace welcomer
