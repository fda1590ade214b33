#include "tools/welcomer/story/ReplayReason.h"

#include <gtest/gtest.h>

namespace welcomer::tool {
namespace {

std::string reasonAfter(std::initializer_list<const char*> lines,
                        std::int32_t status = platform::kCredentialSuccess) {
    KeptLog log;
    for (const char* line : lines) {
        log.write(115, line);
    }
    return replayReason(log, status);
}

TEST(ReplayReason, IsTheLastLine) {
    EXPECT_EQ(reasonAfter({"first", "failed to create /x: no"}), "failed to create /x: no");
}

TEST(ReplayReason, ExplainsTheStatusOfTheCredentialStore) {
    EXPECT_EQ(
        reasonAfter({"Failed to create replay keychain item: 1"}, platform::kCredentialDuplicateItem),
        "Failed to create replay keychain item: 1 (an item with this service and account exists already)");
    EXPECT_EQ(reasonAfter({"Failed to find replay keychain item: -5"}, -5),
              "Failed to find replay keychain item: -5 (unknown credential store status -5)");
}

TEST(ReplayReason, OfStoringSaysWhatElseCanBeDoneWhereTheKeyringCouldNotBeAsked) {
    const auto storing = [](const char* line, const platform::CredentialOutcome& stored) {
        KeptLog log;
        log.write(115, line);
        return storingReason(log, stored);
    };
    EXPECT_EQ(
        storing("Failed to create replay keychain item: 12", {platform::kCredentialNoBus}),
        "Failed to create replay keychain item: 12 (the keyring could not be asked: there is no session "
        "bus); --local stores it in the user's local file");
    EXPECT_EQ(
        storing("Failed to create replay keychain item: 1", {platform::kCredentialDuplicateItem}),
        "Failed to create replay keychain item: 1 (an item with this service and account exists already)");
    EXPECT_EQ(storing("failed to create /x: no", {}), "failed to create /x: no");
}

TEST(ReplayReason, OfStoringSaysWhichPathCouldNotBeWritten) {
    KeptLog log;
    log.write(115, "Failed to create replay keychain item: 6");
    EXPECT_EQ(storingReason(
                  log, {platform::kCredentialWriteFailed, "/home/a/Items.plist: No space left on device"}),
              "Failed to create replay keychain item: 6 (the credential store cannot be written: "
              "/home/a/Items.plist: No space left on device)");
}

TEST(ReplayReason, LeavesTheLineAloneWhereTheStoreDidNotFail) {
    EXPECT_EQ(reasonAfter({"replay keychain item: 1 or 2"}), "replay keychain item: 1 or 2");
    EXPECT_EQ(reasonAfter({"replay keychain item: "}), "replay keychain item: ");
}

TEST(ReplayReason, SaysSoWhenNothingWasLogged) {
    EXPECT_EQ(reasonAfter({}), "no reason was given");
}

} // namespace
} // namespace welcomer::tool
