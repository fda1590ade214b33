// The file of credentials, and what is refused in its place.

#include "backends/local/credentials/LocalCredentialStore.h"
#include "tests/fakes/FakeSystemLog.h"
#include "tests/support/FindCredential.h"
#include "tests/support/SystemCallFaults.h"
#include "tests/unit/backends/local/credentials/LocalCredentialStoreFixture.h"

#include <algorithm>
#include <sys/stat.h>

namespace welcomer::local {

TEST_F(LocalCredentialStoreWithLibraryTest, TheFolderAndTheFileAreTheUsersAloneWhateverTheMask) {
    const mode_t mask = ::umask(0);
    EXPECT_EQ(create("open", "secret"), 0);
    EXPECT_EQ(modeOf(kFolder), 0700U);
    EXPECT_EQ(modeOf(kFile), 0600U);

    std::filesystem::remove_all(root.locate(kFolder));
    ::umask(0777);
    EXPECT_EQ(create("closed", "secret"), 0);
    ::umask(mask);
    EXPECT_EQ(modeOf(kFolder), 0700U);
    EXPECT_EQ(modeOf(kFile), 0600U);
}

TEST_F(LocalCredentialStoreWithLibraryTest, AFailureToCreateSaysWhichPathItWasAbout) {
    const CredentialItem item{"service", "account", "label", std::nullopt};
    root.addFile(kFolder, "a file in the folder's place");
    EXPECT_EQ(store.createItem(item, "secret").detail, root.locate(kFolder) + ": Not a directory");
    std::filesystem::remove(root.locate(kFolder));
    root.addFile(kFile, "no property list <<<");
    std::filesystem::permissions(root.locate(kFolder), std::filesystem::perms::owner_all);
    std::filesystem::permissions(root.locate(kFile), std::filesystem::perms::owner_read);
    const platform::CredentialOutcome damaged = store.createItem(item, "secret");
    EXPECT_EQ(damaged, platform::kCredentialStoreDamaged);
    EXPECT_EQ(damaged.detail, root.locate(kFile));
    EXPECT_EQ(platform::credentialOutcomeText(damaged),
              "the credential store is damaged: " + root.locate(kFile));
}

TEST_F(LocalCredentialStoreWithLibraryTest, ExaminingSaysWhatWouldKeepAnItemFromBeingCreatedAndMakesNothing) {
    EXPECT_EQ(store.examine(), platform::kCredentialSuccess);
    EXPECT_EQ(root.names(kLibrary), Names{});
    root.addFile(kFile, "no property list <<<");
    std::filesystem::permissions(root.locate(kFolder), std::filesystem::perms::owner_all);
    std::filesystem::permissions(root.locate(kFile), std::filesystem::perms::owner_read);
    EXPECT_EQ(store.examine(), platform::kCredentialStoreDamaged);
    std::filesystem::remove(root.locate(kFile));
    EXPECT_EQ(store.examine(), platform::kCredentialSuccess);
    std::filesystem::permissions(root.locate(kFolder), std::filesystem::perms::all);
    EXPECT_EQ(store.examine(), platform::kCredentialStoreUnsafe);
    EXPECT_EQ(store.examine().detail, root.locate(kFolder));
}

TEST_F(LocalCredentialStoreWithLibraryTest, FindingInAStoreThatDoesNotExistCreatesNothing) {
    EXPECT_EQ(statusOf("account"), platform::kCredentialItemNotFound);
    EXPECT_EQ(deleteItem("account"), platform::kCredentialItemNotFound);
    EXPECT_EQ(root.names(kLibrary), Names{});

    root.addDirectory(kFolder);
    EXPECT_EQ(statusOf("account"), platform::kCredentialItemNotFound);
    EXPECT_EQ(deleteItem("account"), platform::kCredentialItemNotFound);
    EXPECT_EQ(root.names(kFolder), Names{});
}

TEST_F(LocalCredentialStoreWithLibraryTest, FindingInAStoreThatDoesNotExistIsOneSystemCall) {
    LocalCredentialStore whole{posix::RootFolder("/"), identity};
    identity.setHomeDirectory(root.locate(kHome));
    SystemCallFaults::count();
    findCredential(whole, nullptr, nullptr);
    EXPECT_EQ(SystemCallFaults::stop(), Names{"stat"});

    root.addDirectory(kFolder);
    SystemCallFaults::count();
    findCredential(whole, nullptr, nullptr);
    EXPECT_EQ(SystemCallFaults::stop(), Names{"stat"});
}

TEST_F(LocalCredentialStoreWithLibraryTest, TheFileIsSyncedBeforeItGetsItsNameAndTheFolderAfterwards) {
    ASSERT_EQ(create("one", "first"), 0);

    SystemCallFaults::count();
    ASSERT_EQ(create("two", "second"), 0);
    const Names calls = SystemCallFaults::stop();

    const auto written = std::find(calls.begin(), calls.end(), "write");
    EXPECT_EQ(Names(written, calls.end()), (Names{"write", "fsync", "renameat", "fsync"}));
}

TEST_F(LocalCredentialStoreWithLibraryTest, DeletingTheLastItemClearsAwayWhatAKilledWriterLeft) {
    ASSERT_EQ(create("account", "secret"), 0);
    root.addFile(kLeftOver, "another secret");

    EXPECT_EQ(deleteItem("account"), 0);
    EXPECT_EQ(root.names(kFolder), Names{});
}

TEST_F(LocalCredentialStoreWithLibraryTest, ADeletionIsSyncedToo) {
    ASSERT_EQ(create("one", "first"), 0);
    std::unique_ptr<CredentialItemReference> reference;
    ASSERT_EQ(findCredential(store, nullptr, &reference, nullptr, "service", "one"), 0);

    SystemCallFaults::count();
    ASSERT_EQ(store.deleteItem(*reference), 0);
    EXPECT_EQ(SystemCallFaults::stop().back(), "fsync");
}

TEST_F(LocalCredentialStoreWithLibraryTest, DeletingTheLastItemRemovesTheFile) {
    ASSERT_EQ(create("one", "first"), 0);
    ASSERT_EQ(create("two", "second"), 0);

    EXPECT_EQ(deleteItem("one"), 0);
    expectClean();
    EXPECT_EQ(deleteItem("two"), 0);
    EXPECT_EQ(root.names(kFolder), Names{});
}

TEST_F(LocalCredentialStoreWithLibraryTest, TheFileIsAnXmlPropertyListThatPeopleCanRead) {
    ASSERT_EQ(store.createItem({"service", "account", "label",
                                platform::CredentialAccess{"who may", {{"/usr/bin/agent"}}}},
                               "secret"),
              0);

    const std::string content = root.content(kFile).value_or("");
    EXPECT_TRUE(content.starts_with("<?xml"));
    for (const char* text : {"service", "account", "label", "who may", "/usr/bin/agent", "c2VjcmV0"}) {
        EXPECT_NE(content.find(text), std::string::npos) << text;
    }
}

TEST_F(LocalCredentialStoreWithLibraryTest, ASymbolicLinkInPlaceOfTheFileIsRefused) {
    root.addFile("/elsewhere", "untouched");
    root.addDirectory(kFolder);
    std::filesystem::permissions(root.locate(kFolder), std::filesystem::perms::owner_all);
    std::filesystem::create_symlink("/elsewhere", root.locate(kFile));

    EXPECT_EQ(statusOf("account"), platform::kCredentialStoreUnsafe);
    EXPECT_EQ(create("account", "secret"), platform::kCredentialStoreUnsafe);
    EXPECT_EQ(deleteItem("account"), platform::kCredentialStoreUnsafe);
    EXPECT_EQ(root.content("/elsewhere"), "untouched");
    EXPECT_TRUE(std::filesystem::is_symlink(root.locate(kFile)));
}

TEST_F(LocalCredentialStoreWithLibraryTest, ADanglingSymbolicLinkInPlaceOfTheFileIsRefusedToo) {
    root.addDirectory(kFolder);
    std::filesystem::create_symlink(root.locate("/elsewhere"), root.locate(kFile));

    EXPECT_EQ(create("account", "secret"), platform::kCredentialStoreUnsafe);
    EXPECT_FALSE(std::filesystem::exists(root.locate("/elsewhere")));
}

TEST_F(LocalCredentialStoreWithLibraryTest, ASymbolicLinkInPlaceOfTheFolderIsRefused) {
    ASSERT_EQ(create("account", "secret"), 0);
    std::filesystem::rename(root.locate(kFolder), root.locate("/elsewhere"));
    std::filesystem::create_symlink("/elsewhere", root.locate(kFolder));

    EXPECT_EQ(statusOf("account"), platform::kCredentialStoreUnsafe);
    EXPECT_EQ(create("other", "secret"), platform::kCredentialStoreUnsafe);
    EXPECT_EQ(deleteItem("account"), platform::kCredentialStoreUnsafe);
}

TEST_F(LocalCredentialStoreWithLibraryTest, ASymbolicLinkInPlaceOfTheTemporaryFileIsNotFollowed) {
    root.addFile("/elsewhere", "untouched");
    ASSERT_EQ(create("one", "first"), 0);
    std::filesystem::create_symlink(root.locate("/elsewhere"), root.locate(kLeftOver));

    EXPECT_EQ(create("two", "second"), 0);
    EXPECT_EQ(root.content("/elsewhere"), "untouched");
    expectClean();
}

TEST_F(LocalCredentialStoreWithLibraryTest, WhatOthersMayWriteIsRefused) {
    ASSERT_EQ(create("account", "secret"), 0);

    for (const mode_t mode : {0620U, 0602U}) {
        ::chmod(root.locate(kFile).c_str(), mode);
        EXPECT_EQ(statusOf("account"), platform::kCredentialStoreUnsafe) << mode;
        EXPECT_EQ(create("other", "secret"), platform::kCredentialStoreUnsafe) << mode;
    }
    ::chmod(root.locate(kFile).c_str(), 0600);
    for (const mode_t mode : {0720U, 0702U}) {
        ::chmod(root.locate(kFolder).c_str(), mode);
        EXPECT_EQ(statusOf("account"), platform::kCredentialStoreUnsafe) << mode;
        EXPECT_EQ(create("other", "secret"), platform::kCredentialStoreUnsafe) << mode;
    }
}

TEST_F(LocalCredentialStoreWithLibraryTest, WhatOthersMayReadIsComplainedAboutOnceAndMadePrivate) {
    ASSERT_EQ(create("account", "secret"), 0);
    fakes::FakeSystemLog log(recorder);
    LocalCredentialStore telling{posix::RootFolder(root.path()), identity, &log};
    const std::string file = "The credentials in " + root.locate(kFile) + " could be read by ";

    for (const auto& [mode, whom] : {std::pair(0644U, "everybody"), std::pair(0640U, "the file's group")}) {
        ::chmod(root.locate(kFile).c_str(), mode);
        EXPECT_EQ(telling.examine(), platform::kCredentialSuccess);
        EXPECT_EQ(modeOf(kFile), mode); // nothing is changed by looking whether it would do
        for (int time = 0; time < 2; ++time) {
            EXPECT_EQ(telling.findItem("service", "account", platform::CredentialWish::Secret).secret,
                      "secret");
        }
        EXPECT_EQ(modeOf(kFile), 0600U);
        EXPECT_EQ(log.lines(), std::vector{file + whom + "; they are the user's alone now"});
        log.clear();
    }
}

TEST_F(LocalCredentialStoreWithLibraryTest, WhatBelongsToAnotherUserIsRefused) {
    if (::geteuid() != 0) {
        GTEST_SKIP() << "only the superuser can give files away";
    }
    ASSERT_EQ(create("account", "secret"), 0);

    ASSERT_EQ(::chown(root.locate(kFile).c_str(), 1, 1), 0);
    EXPECT_EQ(statusOf("account"), platform::kCredentialStoreUnsafe);
    EXPECT_EQ(create("other", "secret"), platform::kCredentialStoreUnsafe);

    ASSERT_EQ(::chown(root.locate(kFile).c_str(), 0, 0), 0);
    ASSERT_EQ(::chown(root.locate(kFolder).c_str(), 1, 1), 0);
    EXPECT_EQ(statusOf("account"), platform::kCredentialStoreUnsafe);
    EXPECT_EQ(create("other", "secret"), platform::kCredentialStoreUnsafe);
    EXPECT_EQ(deleteItem("account"), platform::kCredentialStoreUnsafe);
}

TEST_F(LocalCredentialStoreWithLibraryTest, WhatIsNoRegularFileIsRefusedWithoutBlocking) {
    root.addDirectory(kFolder);
    ASSERT_EQ(::mkfifo(root.locate(kFile).c_str(), 0600), 0);

    EXPECT_EQ(statusOf("account"), platform::kCredentialStoreUnsafe);
    EXPECT_EQ(create("account", "secret"), platform::kCredentialStoreUnsafe);
}

TEST_F(LocalCredentialStoreWithLibraryTest, ADamagedFileIsRefusedAndNeverOverwritten) {
    ASSERT_EQ(create("account", "secret"), 0);
    const std::string whole = root.content(kFile).value_or("");
    const auto replaced = [&](const std::string& from, const std::string& to) {
        std::string text = whole;
        return text.replace(text.find(from), from.size(), to);
    };
    const Names damaged{
        "",
        "no property list at all <",
        whole.substr(0, whole.size() / 2),
        "<?xml version=\"1.0\"?><plist version=\"1.0\"><array/></plist>",
        "<?xml version=\"1.0\"?><plist version=\"1.0\"><dict/></plist>",
        "<?xml version=\"1.0\"?><plist version=\"1.0\"><dict><key>Version</key><integer>1</integer>"
        "<key>Items</key><dict/></dict></plist>",
        replaced("<integer>1<", "<integer>2<"),
        replaced("<key>Service</key>", "<key>Other</key>"),
        replaced("<key>Account</key>", "<key>Other</key>"),
        replaced("<key>Label</key>", "<key>Other</key>"),
        replaced("<key>Data</key>", "<key>Other</key>"),
        replaced("<key>Data</key>", "<key>Access</key><dict/><key>Data</key>"),
    };

    for (const std::string& content : damaged) {
        root.addFile(kFile, content);
        EXPECT_EQ(statusOf("account"), platform::kCredentialStoreDamaged) << content;
        EXPECT_EQ(create("other", "secret"), platform::kCredentialStoreDamaged) << content;
        EXPECT_EQ(deleteItem("account"), platform::kCredentialStoreDamaged) << content;
        EXPECT_EQ(root.content(kFile), content);
    }
    root.addFile(kFile, whole);
    EXPECT_EQ(secret("account"), "secret");
}

TEST_F(LocalCredentialStoreTest, WithoutALibraryFolderNothingIsStored) {
    EXPECT_EQ(create("account", "secret"), platform::kCredentialWriteFailed);
    EXPECT_EQ(statusOf("account"), platform::kCredentialItemNotFound);
    EXPECT_EQ(root.names(kHome), Names{});
}

TEST_F(LocalCredentialStoreTest, WithoutAHomeNothingIsStoredAndNothingIsFound) {
    std::filesystem::remove(root.locate(kHome));

    EXPECT_EQ(statusOf("account"), platform::kCredentialItemNotFound);
    EXPECT_EQ(create("account", "secret"), platform::kCredentialWriteFailed);
    EXPECT_FALSE(std::filesystem::exists(root.locate(kHome)));
}

TEST_F(LocalCredentialStoreWithLibraryTest, CreatingAnItemAsksForTheLibraryFolderAndFindingDoesNot) {
    statusOf("account");
    EXPECT_EQ(recorder.callsTo("ProcessIdentity.userLibraryDirectories").size(), 0U);
    create("account", "secret");
    EXPECT_EQ(recorder.callsTo("ProcessIdentity.userLibraryDirectories").size(), 1U);
}

TEST_F(LocalCredentialStoreWithLibraryTest, AFileWhereTheFolderShouldBeIsLeftAlone) {
    root.addFile(kFolder, "in the way");

    EXPECT_EQ(statusOf("account"), platform::kCredentialReadFailed);
    EXPECT_EQ(create("account", "secret"), platform::kCredentialWriteFailed);
    EXPECT_EQ(deleteItem("account"), platform::kCredentialReadFailed);
    EXPECT_EQ(root.content(kFolder), "in the way");
}

TEST_F(LocalCredentialStoreWithLibraryTest, AFolderWhereTheFileShouldBeIsRefused) {
    root.addDirectory(std::string(kFile) + "/below");

    EXPECT_EQ(statusOf("account"), platform::kCredentialStoreUnsafe);
    EXPECT_EQ(create("account", "secret"), platform::kCredentialStoreUnsafe);
}

TEST_F(LocalCredentialStoreWithLibraryTest, SixtyFourMebibytesComeBack) {
    std::string data(std::size_t{64} << 20, '\0');
    std::uint32_t state = 1;
    for (char& byte : data) {
        state = state * 1664525 + 1013904223;
        byte = static_cast<char>(state >> 24);
    }

    ASSERT_EQ(create("account", data), 0);
    EXPECT_TRUE(secret("account") == data);
    EXPECT_EQ(deleteItem("account"), 0);
}

} // namespace welcomer::local
