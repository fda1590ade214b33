#include "handoff/WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup.h"

#include "handoff/ReplayItem.h"
#include "propertylist/PropertyListWriter.h"
#include "tests/fakes/FakePlatform.h"

#include <cerrno>
#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace welcomer {
namespace {

using Lines = std::vector<std::string>;
using Operation = fakes::FakeCredentialStore::Operation;
using FileOperation = fakes::FakeFileSystem::Operation;

const std::string kTool = "/Setup.app/Resources/wlnimbussetup";
const std::string kResource = "/Setup.app/Resources/com.corvid.welcomer.nimbussetup.user.plist";
const std::string kFolder = "/home/user/Library/LaunchAgents";
const std::string kInstalled = kFolder + "/com.corvid.welcomer.nimbussetup.user.plist";
const std::string kKey = "Welcomer Nimbus Replay Data, Welcomer";

class WriterTest : public testing::Test {
  protected:
    WriterTest() {
        fake.fileSystem.addDirectory("/home/user");
        fake.fileSystem.addFile(kTool, "the agent");
        fake.fileSystem.addFile(kResource, "the launch agent", 0644);
        bundle.add("wlnimbussetup", "", kTool);
        bundle.add("com.corvid.welcomer.nimbussetup.user", "plist", kResource);
    }

    bool write() {
        return WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup("Zo\xC3\xAB", object, bundle);
    }

    std::string storedLine() const {
        return "Stored " + std::to_string(writeXMLPropertyList(object)->size()) +
               "b replay data in user keychain";
    }

    // The one item that was stored.
    fakes::FakeCredentialStore::StoredItem stored() const {
        const auto items = fake.credentialStore.items();
        EXPECT_EQ(items.size(), 1U);
        return items.empty() ? fakes::FakeCredentialStore::StoredItem{} : items[0];
    }

    PropertyList object{PropertyList::Dictionary{{"imAliases", PropertyList::Array{"a", "b"}}}};
    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
    fakes::FakeResourceBundle bundle{fake.recorder};
};

TEST_F(WriterTest, StoresTheItemAndInstallsTheLaunchAgentInThisOrder) {
    EXPECT_TRUE(write());
    EXPECT_EQ(fake.recorder.calls(),
              (Lines{"ResourceBundle.pathForResource wlnimbussetup, ",
                     "CredentialStore.createTrustedApplication " + kTool,
                     "CredentialStore.createAccess Welcomer Nimbus Access",
                     "CredentialStore.createItem " + kKey, "SystemLog.write 115, " + storedLine(),
                     "ResourceBundle.pathForResource com.corvid.welcomer.nimbussetup.user, plist",
                     "ProcessIdentity.userLibraryDirectories", "ProcessIdentity.homeDirectory",
                     "FileSystem.exists " + kFolder, "FileSystem.createDirectory " + kFolder,
                     "FileSystem.copy " + kResource + ", " + kInstalled}));
}

TEST_F(WriterTest, WithoutAHomeThereIsNoPlaceForTheLaunchAgent) {
    fake.processIdentity.setHomeDirectory("");
    EXPECT_FALSE(write());
    EXPECT_EQ(fake.systemLog.lines().back(),
              "failed to install com.corvid.welcomer.nimbussetup: the user user has no home folder");
    EXPECT_EQ(fake.recorder.callsTo("FileSystem."), Lines{});
}

TEST_F(WriterTest, TheItemHasItsAttributesDataAndAccess) {
    EXPECT_TRUE(write());
    const auto [item, data] = stored();
    EXPECT_EQ(item.service, "Welcomer Nimbus Replay Data");
    EXPECT_EQ(item.account, "Welcomer");
    EXPECT_EQ(item.label, "Zo\xC3\xAB");
    EXPECT_EQ(item.access, (platform::CredentialAccess{"Welcomer Nimbus Access", {{kTool}}}));
    EXPECT_EQ(data, writeXMLPropertyList(object));
}

TEST_F(WriterTest, TheReaderReadsBackWhatWasWritten) {
    EXPECT_TRUE(write());
    PropertyList replayObject;
    std::string accountName;
    EXPECT_TRUE(WLGetNimbusReplayKeychainItem(&replayObject, &accountName));
    EXPECT_EQ(replayObject, object);
    EXPECT_EQ(accountName, "Zo\xC3\xAB");
}

TEST_F(WriterTest, WithoutTheToolResourceTheItemHasDefaultAccessAndNothingIsLogged) {
    fakes::FakeResourceBundle toolless(fake.recorder);
    toolless.add("com.corvid.welcomer.nimbussetup.user", "plist", kResource);
    EXPECT_TRUE(WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup("a", object, toolless));
    EXPECT_EQ(stored().item.access, std::nullopt);
    EXPECT_EQ(fake.systemLog.lines(), (Lines{storedLine()}));
    EXPECT_EQ(fake.recorder.callsTo("CredentialStore."), (Lines{"CredentialStore.createItem " + kKey}));
}

TEST_F(WriterTest, AFailedTrustedApplicationIsLoggedAndTheItemHasDefaultAccess) {
    fake.credentialStore.setStatus(Operation::CreateTrustedApplication, platform::kCredentialInvalidPath);
    EXPECT_TRUE(write());
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"Failed to create trusted app for replay keychain item: 7", storedLine()}));
    EXPECT_EQ(stored().item.access, std::nullopt);
    EXPECT_EQ(fake.recorder.callsTo("CredentialStore.createAccess"), Lines{});
}

TEST_F(WriterTest, AFailedAccessIsLoggedAndTheItemHasDefaultAccess) {
    fake.credentialStore.setStatus(Operation::CreateAccess, -4);
    EXPECT_TRUE(write());
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"Failed to create access ref for replay keychain item: -4", storedLine()}));
    EXPECT_EQ(stored().item.access, std::nullopt);
}

TEST_F(WriterTest, AFailedItemIsLoggedAndNothingIsInstalled) {
    fake.credentialStore.setStatus(Operation::CreateItem, platform::kCredentialWriteFailed);
    EXPECT_FALSE(write());
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Failed to create replay keychain item: 6"}));
    EXPECT_EQ(fake.credentialStore.items().size(), 0U);
    EXPECT_EQ(fake.recorder.callsTo("FileSystem."), Lines{});
    EXPECT_EQ(fake.recorder.callsTo("ProcessIdentity."), Lines{});
}

TEST_F(WriterTest, WritingTwiceFailsAtTheItemAndReplacesNothing) {
    EXPECT_TRUE(write());
    const std::string first = stored().data;
    fake.systemLog.clear();
    object = PropertyList::Dictionary{{"other", true}};
    EXPECT_FALSE(write());
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Failed to create replay keychain item: 1"}));
    EXPECT_EQ(stored().data, first);
}

TEST_F(WriterTest, WhatCannotBeSerialisedIsStoredAsNoData) {
    object = PropertyList("\xFF no UTF-8");
    EXPECT_TRUE(write());
    EXPECT_EQ(stored().data, "");
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Stored 0b replay data in user keychain"}));
}

TEST_F(WriterTest, AnyPropertyListIsStored) {
    object = PropertyList::Array{1, 2.5, true};
    EXPECT_TRUE(write());
    EXPECT_EQ(stored().data, writeXMLPropertyList(object));
}

TEST_F(WriterTest, AnEmptyAccountNameIsStored) {
    EXPECT_TRUE(WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup("", object, bundle));
    EXPECT_EQ(stored().item.label, "");
}

TEST_F(WriterTest, AMissingLaunchAgentsFolderIsMadeWithMode0755) {
    EXPECT_TRUE(write());
    EXPECT_EQ(fake.fileSystem.mode(kFolder), 0755U);
    EXPECT_EQ(fake.fileSystem.content(kInstalled), "the launch agent");
}

TEST_F(WriterTest, AnExistingLaunchAgentsFolderIsUsedWhateverItsMode) {
    fake.fileSystem.addDirectory(kFolder, 0700);
    EXPECT_TRUE(write());
    EXPECT_EQ(fake.fileSystem.mode(kFolder), 0700U);
    EXPECT_EQ(fake.recorder.callsTo("FileSystem.createDirectory"), Lines{});
    EXPECT_EQ(fake.fileSystem.content(kInstalled), "the launch agent");
}

TEST_F(WriterTest, AHomeWithoutALibraryFolderGetsOneFromThePlatform) {
    ASSERT_FALSE(fake.fileSystem.isDirectory("/home/user/Library"));
    EXPECT_TRUE(write());
    EXPECT_EQ(fake.fileSystem.mode("/home/user/Library"), 0700U);
}

TEST_F(WriterTest, TheFolderIsInTheHomesLibraryWhateverTheLibraryDirectoriesAre) {
    for (const std::vector<std::string>& directories :
         {std::vector<std::string>{"/elsewhere/Library", "/home/user/Library"}, std::vector<std::string>{}}) {
        fakes::FakePlatform own;
        const platform::ScopedPlatform ownInstalled(own.platform());
        own.fileSystem.addFile(kResource, "the launch agent");
        own.fileSystem.addDirectory("/elsewhere/Library");
        own.fileSystem.addDirectory("/home/user/Library");
        own.processIdentity.setUserLibraryDirectories(directories);
        EXPECT_TRUE(write());
        EXPECT_EQ(own.fileSystem.content(kInstalled), "the launch agent");
        EXPECT_FALSE(own.fileSystem.exists("/elsewhere/Library/LaunchAgents"));
    }
}

TEST_F(WriterTest, TheFoldersParentsAreNotMade) {
    fake.processIdentity.setHomeDirectory("/home/nobody");
    EXPECT_FALSE(write());
    EXPECT_FALSE(fake.fileSystem.isDirectory("/home/nobody"));
    const Lines lines = fake.systemLog.lines();
    ASSERT_EQ(lines.size(), 2U);
    const std::string beginning = "failed to create /home/nobody/Library/LaunchAgents: ";
    EXPECT_EQ(lines[1].substr(0, beginning.size()), beginning);
}

TEST_F(WriterTest, AFolderThatCannotBeMadeIsLoggedAndTheItemStays) {
    fake.fileSystem.fail(FileOperation::CreateDirectory, kFolder, EACCES, "no permission");
    EXPECT_FALSE(write());
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{storedLine(), "failed to create " + kFolder + ": no permission"}));
    EXPECT_EQ(stored().data, writeXMLPropertyList(object));
    EXPECT_EQ(fake.recorder.callsTo("FileSystem.copy"), Lines{});
}

TEST_F(WriterTest, AFolderThatAppearsMeanwhileIsUsed) {
    fake.fileSystem.addDirectory(kFolder);
    fake.fileSystem.fail(FileOperation::Exists, kFolder, ENOENT);
    fake.fileSystem.fail(FileOperation::CreateDirectory, kFolder, EEXIST, "it is there");
    EXPECT_TRUE(write());
    EXPECT_EQ(fake.systemLog.lines(), (Lines{storedLine()}));
    EXPECT_EQ(fake.fileSystem.content(kInstalled), "the launch agent");
}

TEST_F(WriterTest, ALaunchAgentFileThatIsThereIsNotOverwritten) {
    fake.fileSystem.addFile(kInstalled, "an earlier one");
    EXPECT_FALSE(write());
    const Lines lines = fake.systemLog.lines();
    ASSERT_EQ(lines.size(), 2U);
    const std::string beginning = "failed to install com.corvid.welcomer.nimbussetup: ";
    EXPECT_EQ(lines[1].substr(0, beginning.size()), beginning);
    EXPECT_GT(lines[1].size(), beginning.size());
    EXPECT_EQ(fake.fileSystem.content(kInstalled), "an earlier one");
    EXPECT_EQ(fake.credentialStore.items().size(), 1U);
}

TEST_F(WriterTest, ACopyThatFailsIsLoggedAndTheItemStays) {
    fake.fileSystem.fail(FileOperation::Copy, kInstalled, ENOSPC, "the disk is full");
    EXPECT_FALSE(write());
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{storedLine(), "failed to install com.corvid.welcomer.nimbussetup: the disk is full"}));
    EXPECT_EQ(fake.credentialStore.items().size(), 1U);
    EXPECT_EQ(fake.fileSystem.content(kInstalled), std::nullopt);
}

TEST_F(WriterTest, ALaunchAgentsPathThatIsAFileFailsTheCopy) {
    fake.fileSystem.addFile(kFolder, "a file");
    EXPECT_FALSE(write());
    const Lines lines = fake.systemLog.lines();
    ASSERT_EQ(lines.size(), 2U);
    EXPECT_EQ(lines[1].substr(0, 50), "failed to install com.corvid.welcomer.nimbussetup:");
    EXPECT_EQ(fake.fileSystem.content(kFolder), "a file");
}

TEST_F(WriterTest, ABundleWithoutTheLaunchAgentFailsTheInstallation) {
    fakes::FakeResourceBundle incomplete(fake.recorder);
    EXPECT_FALSE(WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup("a", object, incomplete));
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{storedLine(), "failed to install com.corvid.welcomer.nimbussetup: "
                                   "the bundle has no launch-agent file"}));
    EXPECT_TRUE(fake.fileSystem.isDirectory(kFolder));
}

TEST_F(WriterTest, TheHomeFolderMayBeTheRootFolder) {
    fake.processIdentity.setHomeDirectory("/");
    EXPECT_TRUE(write());
    EXPECT_EQ(fake.fileSystem.content("/Library/LaunchAgents/com.corvid.welcomer.nimbussetup.user.plist"),
              "the launch agent");
}

} // namespace
} // namespace welcomer
