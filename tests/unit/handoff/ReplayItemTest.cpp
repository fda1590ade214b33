#include "handoff/ReplayItem.h"

#include "propertylist/PropertyListWriter.h"
#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace welcomer {
namespace {

using Lines = std::vector<std::string>;
using Operation = fakes::FakeCredentialStore::Operation;

const std::string kKey = "Welcomer Nimbus Replay Data, Welcomer";

class ReplayItemTest : public testing::Test {
  protected:
    void put(const std::string& data, const std::string& label = "anna@example.com") {
        fake.credentialStore.put({"Welcomer Nimbus Replay Data", "Welcomer", label, std::nullopt}, data);
    }

    // Whether data that is no property list is refused with one log line, and the item stays.
    void expectRefused(const std::string& data) {
        put(data);
        PropertyList replayObject = "untouched";
        std::string accountName = "untouched";
        EXPECT_FALSE(WLGetNimbusReplayKeychainItem(&replayObject, &accountName));
        EXPECT_EQ(replayObject, PropertyList("untouched"));
        EXPECT_EQ(accountName, "untouched");
        const Lines lines = fake.systemLog.lines();
        ASSERT_EQ(lines.size(), 1U);
        const std::string beginning = "Failed to deserialize replayable data length: ";
        EXPECT_EQ(lines[0].substr(0, beginning.size()), beginning);
        EXPECT_GT(lines[0].size(), beginning.size()) << "the error is missing";
        ASSERT_EQ(fake.credentialStore.items().size(), 1U);
        EXPECT_EQ(fake.credentialStore.items()[0].data, data);
    }

    const PropertyList object{PropertyList::Dictionary{{"vlAliases", PropertyList::Array{"anna@example.com"}},
                                                       {"delegatesResponseDict", PropertyList()}}};
    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
};

TEST_F(ReplayItemTest, TheReaderGivesTheObjectAndTheLabel) {
    put(*writeXMLPropertyList(object), "Zo\xC3\xAB");
    PropertyList replayObject;
    std::string accountName;
    EXPECT_TRUE(WLGetNimbusReplayKeychainItem(&replayObject, &accountName));
    EXPECT_EQ(replayObject, object);
    EXPECT_EQ(accountName, "Zo\xC3\xAB");
    EXPECT_EQ(fake.recorder.calls(), (Lines{"CredentialStore.findItem " + kKey}));
}

TEST_F(ReplayItemTest, TheReaderDoesNotDeleteTheItem) {
    put(*writeXMLPropertyList(object));
    PropertyList replayObject;
    EXPECT_TRUE(WLGetNimbusReplayKeychainItem(&replayObject, nullptr));
    EXPECT_EQ(fake.credentialStore.items().size(), 1U);
}

TEST_F(ReplayItemTest, TheReaderGivesAnEmptyLabelAsAnEmptyAccountName) {
    put(*writeXMLPropertyList(object), "");
    std::string accountName = "before";
    EXPECT_TRUE(WLGetNimbusReplayKeychainItem(nullptr, &accountName));
    EXPECT_EQ(accountName, "");
}

TEST_F(ReplayItemTest, TheReaderWithoutAnItemLogsTheStatus) {
    PropertyList replayObject = "untouched";
    std::string accountName = "untouched";
    EXPECT_FALSE(WLGetNimbusReplayKeychainItem(&replayObject, &accountName));
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Failed to find replay keychain item: 2"}));
    EXPECT_EQ(replayObject, PropertyList("untouched"));
    EXPECT_EQ(accountName, "untouched");
}

TEST_F(ReplayItemTest, AnItemOfAnotherServiceOrAccountIsNotTheReplayItem) {
    fake.credentialStore.put({"Welcomer Nimbus Replay Data", "Other", "", std::nullopt}, "{}");
    fake.credentialStore.put({"Other", "Welcomer", "", std::nullopt}, "{}");
    EXPECT_FALSE(WLGetNimbusReplayKeychainItem(nullptr, nullptr));
    EXPECT_FALSE(WLDeleteNimbusReplayKeychainItem());
    EXPECT_EQ(fake.credentialStore.items().size(), 2U);
}

TEST_F(ReplayItemTest, TheReaderLogsAStatusWithItsSign) {
    put("{}");
    fake.credentialStore.setStatus(Operation::FindItem, -25300);
    EXPECT_FALSE(WLGetNimbusReplayKeychainItem(nullptr, nullptr));
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Failed to find replay keychain item: -25300"}));
}

TEST_F(ReplayItemTest, TheReaderWithBothOutputsAbsentDeserialisesNothing) {
    put("no property list at all <<<");
    EXPECT_TRUE(WLGetNimbusReplayKeychainItem(nullptr, nullptr));
    EXPECT_EQ(fake.recorder.calls(), (Lines{"CredentialStore.findItem " + kKey}));
}

TEST_F(ReplayItemTest, TheReaderWithoutAnObjectOutputReadsTheLabelAlone) {
    put("no property list at all <<<");
    std::string accountName;
    EXPECT_TRUE(WLGetNimbusReplayKeychainItem(nullptr, &accountName));
    EXPECT_EQ(accountName, "anna@example.com");
    EXPECT_EQ(fake.systemLog.lines(), Lines{});
}

TEST_F(ReplayItemTest, TheReaderWithoutAnAccountNameOutputReadsNoLabel) {
    put(*writeXMLPropertyList(object));
    fake.credentialStore.setStatus(Operation::ReadAttributes, platform::kCredentialReadFailed);
    PropertyList replayObject;
    EXPECT_TRUE(WLGetNimbusReplayKeychainItem(&replayObject, nullptr));
    EXPECT_EQ(replayObject, object);
    EXPECT_EQ(fake.recorder.callsTo("CredentialStore."), (Lines{"CredentialStore.findItem " + kKey}));
}

TEST_F(ReplayItemTest, TheReaderLogsALabelThatCannotBeRead) {
    put(*writeXMLPropertyList(object));
    fake.credentialStore.setStatus(Operation::ReadAttributes, platform::kCredentialItemNotFound);
    PropertyList replayObject;
    std::string accountName = "untouched";
    EXPECT_FALSE(WLGetNimbusReplayKeychainItem(&replayObject, &accountName));
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Failed to get account name attribute"}));
    EXPECT_EQ(accountName, "untouched");
}

TEST_F(ReplayItemTest, AllOfTheItemIsReadWithOneLookIntoTheStore) {
    const platform::CredentialAccess access{"for the agent", {{"/usr/libexec/wlnimbussetup"}}};
    fake.credentialStore.put({kReplayItemService, kReplayItemAccount, "Zo\xC3\xAB", access},
                             *writeXMLPropertyList(object));
    ReplayItem found;
    EXPECT_TRUE(WLGetNimbusReplayKeychainItem(found));
    EXPECT_EQ(found.replayObject, object);
    EXPECT_EQ(found.item.label, "Zo\xC3\xAB");
    EXPECT_EQ(found.item.access, access);
    ASSERT_NE(found.reference, nullptr);
    EXPECT_NE(found.reference->store().name, "");
    EXPECT_EQ(fake.recorder.calls(), (Lines{"CredentialStore.findItem " + kKey}));
}

TEST_F(ReplayItemTest, WhatKeepsTheReaderFromItsWorkKeepsTheOtherOneToo) {
    ReplayItem found;
    found.item.label = "untouched";
    EXPECT_FALSE(WLGetNimbusReplayKeychainItem(found));
    put("no property list at all <<<");
    EXPECT_FALSE(WLGetNimbusReplayKeychainItem(found));
    fake.credentialStore.put({kReplayItemService, kReplayItemAccount, "anna@example.com", std::nullopt},
                             *writeXMLPropertyList(object));
    fake.credentialStore.setStatus(Operation::ReadAttributes, platform::kCredentialReadFailed);
    EXPECT_FALSE(WLGetNimbusReplayKeychainItem(found));
    EXPECT_EQ(found.item.label, "untouched");
    EXPECT_EQ(found.replayObject, PropertyList());
    const Lines lines = fake.systemLog.lines();
    ASSERT_EQ(lines.size(), 3U);
    EXPECT_EQ(lines[0], "Failed to find replay keychain item: 2");
    EXPECT_TRUE(lines[1].starts_with("Failed to deserialize replayable data length: ")) << lines[1];
    EXPECT_EQ(lines[2], "Failed to get account name attribute");
}

TEST_F(ReplayItemTest, TheLabelIsNotReadBeforeTheObjectIsUnderstood) {
    put("no property list at all <<<");
    fake.credentialStore.setStatus(Operation::ReadAttributes, platform::kCredentialReadFailed);
    PropertyList replayObject;
    std::string accountName;
    EXPECT_FALSE(WLGetNimbusReplayKeychainItem(&replayObject, &accountName));
    ReplayItem found;
    EXPECT_FALSE(WLGetNimbusReplayKeychainItem(found));
    EXPECT_EQ(fake.recorder.callsTo("CredentialStore."), Lines(2, "CredentialStore.findItem " + kKey));
    const Lines lines = fake.systemLog.lines();
    ASSERT_EQ(lines.size(), 2U);
    for (const std::string& line : lines) {
        EXPECT_TRUE(line.starts_with("Failed to deserialize replayable data length: ")) << line;
    }
}

TEST_F(ReplayItemTest, TheReaderTakesAnObjectThatIsNoDictionary) {
    put(*writeXMLPropertyList(PropertyList::Array{1, "two"}));
    PropertyList replayObject;
    EXPECT_TRUE(WLGetNimbusReplayKeychainItem(&replayObject, nullptr));
    EXPECT_EQ(replayObject, PropertyList(PropertyList::Array{1, "two"}));
}

TEST_F(ReplayItemTest, EmptyDataIsRefused) {
    expectRefused("");
}

TEST_F(ReplayItemTest, TruncatedDataIsRefused) {
    const std::string whole = *writeXMLPropertyList(object);
    expectRefused(whole.substr(0, whole.size() / 2));
}

TEST_F(ReplayItemTest, DataNestedAHundredThousandDeepIsRefused) {
    std::string data = "<plist version=\"1.0\">";
    for (int i = 0; i < 100'000; ++i) {
        data += "<array>";
    }
    for (int i = 0; i < 100'000; ++i) {
        data += "</array>";
    }
    expectRefused(data + "</plist>");
}

TEST_F(ReplayItemTest, BytesOfNoFormatAreRefused) {
    expectRefused(std::string("\x00\xFF\xFE\x01\x80garbage", 12));
}

TEST_F(ReplayItemTest, DeletingFindsTheItemWithoutItsDataAndDeletesIt) {
    put("anything");
    EXPECT_TRUE(WLDeleteNimbusReplayKeychainItem());
    EXPECT_EQ(fake.credentialStore.items().size(), 0U);
    EXPECT_EQ(fake.recorder.calls(),
              (Lines{"CredentialStore.findItem " + kKey, "CredentialStore.deleteItem " + kKey}));
    EXPECT_EQ(fake.credentialStore.dataReads(), 0);
}

TEST_F(ReplayItemTest, WhatHasBeenReadIsDeletedWithoutAnotherLook) {
    put(*writeXMLPropertyList(object));
    ReplayItem found;
    ASSERT_TRUE(WLGetNimbusReplayKeychainItem(found));
    EXPECT_TRUE(WLDeleteNimbusReplayKeychainItem(found));
    EXPECT_EQ(fake.credentialStore.items().size(), 0U);
    EXPECT_EQ(fake.recorder.calls(),
              (Lines{"CredentialStore.findItem " + kKey, "CredentialStore.deleteItem " + kKey}));
    EXPECT_FALSE(WLDeleteNimbusReplayKeychainItem(found));
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Failed to delete replay keychain item: 2"}));
}

TEST_F(ReplayItemTest, DeletingLogsTheStatusOfFinding) {
    EXPECT_FALSE(WLDeleteNimbusReplayKeychainItem());
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Failed to delete replay keychain item: 2"}));
    EXPECT_EQ(fake.recorder.callsTo("CredentialStore."), (Lines{"CredentialStore.findItem " + kKey}));
}

TEST_F(ReplayItemTest, DeletingLogsTheStatusOfDeleting) {
    put("anything");
    fake.credentialStore.setStatus(Operation::DeleteItem, platform::kCredentialWriteFailed);
    EXPECT_FALSE(WLDeleteNimbusReplayKeychainItem());
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Failed to delete replay keychain item: 6"}));
    EXPECT_EQ(fake.credentialStore.items().size(), 1U);
}

TEST_F(ReplayItemTest, WhoReadsTheWholeItemIsToldTheStatusOfFindingIt) {
    ReplayItem found;
    std::int32_t status = platform::kCredentialWriteFailed;
    EXPECT_FALSE(WLGetNimbusReplayKeychainItem(found, status));
    EXPECT_EQ(status, platform::kCredentialItemNotFound);
    put("no property list");
    EXPECT_FALSE(WLGetNimbusReplayKeychainItem(found, status));
    EXPECT_EQ(status, platform::kCredentialSuccess);
}

TEST_F(ReplayItemTest, WhoDeletesIsToldTheStatus) {
    std::int32_t status = platform::kCredentialSuccess;
    EXPECT_FALSE(WLDeleteNimbusReplayKeychainItem(status));
    EXPECT_EQ(status, platform::kCredentialItemNotFound);
    put("anything");
    fake.credentialStore.setStatus(Operation::DeleteItem, platform::kCredentialWriteFailed);
    EXPECT_FALSE(WLDeleteNimbusReplayKeychainItem(status));
    EXPECT_EQ(status, platform::kCredentialWriteFailed);
    fake.credentialStore.setStatus(Operation::DeleteItem, platform::kCredentialSuccess);
    EXPECT_TRUE(WLDeleteNimbusReplayKeychainItem(status));
    EXPECT_EQ(status, platform::kCredentialSuccess);
}

} // namespace
} // namespace welcomer
