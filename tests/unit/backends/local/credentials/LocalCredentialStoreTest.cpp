#include "backends/local/credentials/LocalCredentialStore.h"

#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeFileSystem.h"
#include "tests/fakes/FakeProcessIdentity.h"
#include "tests/support/FindCredential.h"
#include "tests/support/MountNamespace.h"
#include "tests/support/SystemCallFaults.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <fstream>
#include <functional>
#include <sched.h>
#include <sys/stat.h>
#include <sys/wait.h>

namespace welcomer::local {

namespace {

using platform::CredentialItem;
using platform::CredentialItemReference;
using Names = std::vector<std::string>;

constexpr char kHome[] = "/home/user";
constexpr char kLibrary[] = "/home/user/Library";
constexpr char kFolder[] = "/home/user/Library/Credentials";
constexpr char kFile[] = "/home/user/Library/Credentials/Items.plist";
constexpr char kLeftOver[] = "/home/user/Library/Credentials/.Items.plist.new";

class LocalCredentialStoreTest : public testing::Test {
  protected:
    LocalCredentialStoreTest() { root.addDirectory(kHome); }

    std::int32_t create(const std::string& account, const std::string& data) {
        return store.createItem({"service", account, "label", std::nullopt}, data).status;
    }

    std::int32_t statusOf(const std::string& account) {
        return findCredential(store, nullptr, nullptr, nullptr, "service", account);
    }

    std::optional<std::string> secret(const std::string& account) {
        std::string data;
        const std::int32_t status = findCredential(store, &data, nullptr, nullptr, "service", account);
        return status == platform::kCredentialSuccess ? std::optional(data) : std::nullopt;
    }

    // Deletes without the store's find, which a broken store may refuse.
    std::int32_t deleteItem(const std::string& account) {
        TemporaryRoot other;
        other.addDirectory(kLibrary);
        LocalCredentialStore otherStore(posix::RootFolder(other.path()), identity);
        std::unique_ptr<CredentialItemReference> reference;
        EXPECT_EQ(otherStore.createItem({"service", account, "", std::nullopt}, ""), 0);
        EXPECT_EQ(findCredential(otherStore, nullptr, &reference, nullptr, "service", account), 0);
        return store.deleteItem(*reference);
    }

    mode_t modeOf(const std::string& path) {
        struct stat status = {};
        EXPECT_EQ(::lstat(root.locate(path).c_str(), &status), 0) << path;
        return status.st_mode & 07777;
    }

    // Runs something in a process of its own.
    //  result  its exit status, or 128 and the signal that ended it
    static int inChild(const std::function<void()>& body) {
        const pid_t child = ::fork();
        if (child == 0) {
            body();
            ::_exit(0);
        }
        int status = 0;
        ::waitpid(child, &status, 0);
        return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
    }

    // Nothing may be left of a writer that failed or was killed once the next one has been there.
    void expectClean() {
        EXPECT_EQ(root.names(kFolder), Names{"Items.plist"});
        EXPECT_EQ(modeOf(kFile), 0600U);
    }

    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem{recorder};
    fakes::FakeProcessIdentity identity{recorder, fileSystem};
    TemporaryRoot root;
    LocalCredentialStore store{posix::RootFolder(root.path()), identity};
};

// What stands for any secret in the tests of faults: longer than one page, so that it can be written in part.
const std::string kSecret(10000, 's');

} // namespace

// The fake identity makes no folder on this machine.
class LocalCredentialStoreWithLibraryTest : public LocalCredentialStoreTest {
  protected:
    LocalCredentialStoreWithLibraryTest() { root.addDirectory(kLibrary); }

    // A write fails at every system call in turn; the store must be as before or as after, never anything
    // else, and the other item must stay.
    void expectAllOrNothingOnFailure(int error, bool otherItem);
    void expectAllOrNothingOnCrash(bool otherItem);
    void expectDeletionAllOrNothing(bool otherItem);
};

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

TEST_F(LocalCredentialStoreWithLibraryTest, OfProcessesThatCreateTheSameItemOneSucceeds) {
    constexpr int kProcesses = 8;
    for (int round = 0; round < 20; ++round) {
        std::filesystem::remove_all(root.locate(kFolder)); // they race for the folder too
        int gate[2] = {};
        ASSERT_EQ(::pipe(gate), 0);
        std::vector<pid_t> children;
        for (int index = 0; index < kProcesses; ++index) {
            const pid_t child = ::fork();
            if (child == 0) {
                ::close(gate[1]);
                char byte = 0;
                const bool opened = ::read(gate[0], &byte, 1) == 0;
                ::_exit(opened ? create("account", std::to_string(::getpid())) : 99);
            }
            children.push_back(child);
        }
        ::close(gate[0]);
        ::close(gate[1]); // all of them start now

        std::optional<std::string> winner;
        for (const pid_t child : children) {
            int status = 0;
            ASSERT_EQ(::waitpid(child, &status, 0), child);
            if (WEXITSTATUS(status) == platform::kCredentialSuccess) {
                EXPECT_EQ(winner, std::nullopt);
                winner = std::to_string(child);
            } else {
                EXPECT_EQ(WEXITSTATUS(status), platform::kCredentialDuplicateItem);
            }
        }
        EXPECT_NE(winner, std::nullopt);
        EXPECT_EQ(secret("account"), winner);
        EXPECT_EQ(deleteItem("account"), 0);
        EXPECT_EQ(root.names(kFolder), Names{});
    }
}

TEST_F(LocalCredentialStoreWithLibraryTest, ProcessesThatCreateDifferentItemsLoseNone) {
    constexpr int kProcesses = 12;
    std::vector<pid_t> children;
    for (int index = 0; index < kProcesses; ++index) {
        const pid_t child = ::fork();
        if (child == 0) {
            ::_exit(create("account " + std::to_string(index), "secret"));
        }
        children.push_back(child);
    }
    for (const pid_t child : children) {
        int status = 0;
        ASSERT_EQ(::waitpid(child, &status, 0), child);
        EXPECT_EQ(WEXITSTATUS(status), platform::kCredentialSuccess);
    }
    for (int index = 0; index < kProcesses; ++index) {
        EXPECT_EQ(secret("account " + std::to_string(index)), "secret") << index;
    }
    expectClean();
}

void LocalCredentialStoreWithLibraryTest::expectAllOrNothingOnFailure(int error, bool otherItem) {
    for (int number = 1;; ++number) {
        std::filesystem::remove_all(root.locate(kFolder));
        ASSERT_TRUE(!otherItem || create("other", "kept") == 0);

        SystemCallFaults::failAt(number, error);
        const std::int32_t status = create("account", kSecret);
        const auto calls = static_cast<int>(SystemCallFaults::stop().size());

        const auto where = testing::Message() << "call " << number << " of " << calls << ", error " << error;
        if (status == platform::kCredentialSuccess) {
            EXPECT_EQ(secret("account"), kSecret) << where;
        } else {
            EXPECT_EQ(statusOf("account"), platform::kCredentialItemNotFound) << where;
            EXPECT_EQ(create("account", kSecret), platform::kCredentialSuccess) << where;
        }
        EXPECT_EQ(secret("other"), otherItem ? std::optional<std::string>("kept") : std::nullopt) << where;
        expectClean();
        if (number > calls) {
            EXPECT_EQ(status, platform::kCredentialSuccess);
            EXPECT_GT(number, 10); // the faults were met
            return;
        }
    }
}

TEST_F(LocalCredentialStoreWithLibraryTest, CreatingTheFirstItemIsAllOrNothingWhicheverCallFails) {
    for (const int error : {ENOSPC, EIO, EACCES, EROFS}) {
        expectAllOrNothingOnFailure(error, false);
    }
}

TEST_F(LocalCredentialStoreWithLibraryTest, CreatingAnotherItemIsAllOrNothingWhicheverCallFails) {
    for (const int error : {ENOSPC, EIO, EACCES, EROFS}) {
        expectAllOrNothingOnFailure(error, true);
    }
}

void LocalCredentialStoreWithLibraryTest::expectAllOrNothingOnCrash(bool otherItem) {
    for (int number = 1;; ++number) {
        std::filesystem::remove_all(root.locate(kFolder));
        ASSERT_TRUE(!otherItem || create("other", "kept") == 0);

        const int end = inChild([&] {
            SystemCallFaults::crashAt(number);
            if (create("account", kSecret) != 0) {
                ::_exit(1);
            }
        });

        const auto where = testing::Message() << "crashed at call " << number;
        ASSERT_TRUE(end == 0 || end == SystemCallFaults::kCrashed) << where << ": " << end;
        const std::int32_t found = statusOf("account");
        if (found == platform::kCredentialSuccess) {
            EXPECT_EQ(secret("account"), kSecret) << where;
        } else {
            EXPECT_EQ(found, platform::kCredentialItemNotFound) << where;
        }
        // The next writer meets whole items alone, and clears away what the dead one left.
        EXPECT_EQ(create("next", "writer"), platform::kCredentialSuccess) << where;
        EXPECT_EQ(statusOf("account"), found) << where;
        EXPECT_EQ(secret("other"), otherItem ? std::optional<std::string>("kept") : std::nullopt) << where;
        expectClean();
        if (end == 0) {
            EXPECT_EQ(found, platform::kCredentialSuccess);
            EXPECT_GT(number, 10);
            return;
        }
    }
}

TEST_F(LocalCredentialStoreWithLibraryTest, CreatingTheFirstItemIsAllOrNothingWhereverTheProcessIsKilled) {
    expectAllOrNothingOnCrash(false);
}

TEST_F(LocalCredentialStoreWithLibraryTest, CreatingAnotherItemIsAllOrNothingWhereverTheProcessIsKilled) {
    expectAllOrNothingOnCrash(true);
}

void LocalCredentialStoreWithLibraryTest::expectDeletionAllOrNothing(bool otherItem) {
    std::unique_ptr<CredentialItemReference> reference;
    for (int number = 1;; ++number) {
        std::filesystem::remove_all(root.locate(kFolder));
        ASSERT_TRUE(!otherItem || create("other", "kept") == 0);
        ASSERT_EQ(create("account", kSecret), 0);
        ASSERT_EQ(findCredential(store, nullptr, &reference), 0);

        SystemCallFaults::failAt(number, ENOSPC);
        const std::int32_t status = store.deleteItem(*reference);
        const auto calls = static_cast<int>(SystemCallFaults::stop().size());

        const auto where = testing::Message() << "call " << number << " of " << calls;
        EXPECT_EQ(secret("account"),
                  status == platform::kCredentialSuccess ? std::nullopt : std::optional(kSecret))
            << where;
        EXPECT_EQ(secret("other"), otherItem ? std::optional<std::string>("kept") : std::nullopt) << where;
        if (number > calls) {
            EXPECT_EQ(status, platform::kCredentialSuccess);
            return;
        }
    }
}

TEST_F(LocalCredentialStoreWithLibraryTest, DeletingIsAllOrNothingWhicheverCallFails) {
    expectDeletionAllOrNothing(false);
    expectDeletionAllOrNothing(true);
}

TEST_F(LocalCredentialStoreWithLibraryTest, AProcessThatIsKilledAtAnyMomentLeavesWholeItems) {
    const std::string large(200000, 'l');
    std::unique_ptr<CredentialItemReference> reference;
    ASSERT_EQ(create("other", "kept"), 0);
    ASSERT_EQ(create("account", large), 0);
    ASSERT_EQ(findCredential(store, nullptr, &reference), 0);
    ASSERT_EQ(store.deleteItem(*reference), 0);
    for (int round = 0; round < 30; ++round) {
        int progress[2] = {};
        ASSERT_EQ(::pipe(progress), 0);
        const pid_t child = ::fork();
        if (child == 0) {
            while (true) {
                const char byte = 0;
                const bool told = ::write(progress[1], &byte, 1) == 1;
                create("account", large);
                if (!told || store.deleteItem(*reference) != 0) {
                    ::_exit(1);
                }
            }
        }
        // Killed while it creates or deletes, a little later in each round.
        ::close(progress[1]);
        char byte = 0;
        for (int count = 0; count <= round % 3; ++count) {
            ASSERT_EQ(::read(progress[0], &byte, 1), 1);
        }
        for (int turn = 0; turn < round; ++turn) {
            ::sched_yield();
        }
        ::kill(child, SIGKILL);
        int status = 0;
        ASSERT_EQ(::waitpid(child, &status, 0), child);
        ::close(progress[0]);
        ASSERT_TRUE(WIFSIGNALED(status)) << "the child failed: " << status;

        const std::int32_t found = statusOf("account");
        ASSERT_TRUE(found == platform::kCredentialItemNotFound || secret("account") == large) << found;
        ASSERT_EQ(secret("other"), "kept");
        if (found == platform::kCredentialSuccess) {
            ASSERT_EQ(store.deleteItem(*reference), 0);
        }
    }
    ASSERT_EQ(create("next", "writer"), 0);
    expectClean();
}

// The tests below give the process file systems of its own.
class LocalCredentialStoreOnDiskTest : public LocalCredentialStoreTest {
  protected:
    void SetUp() override {
        if (!mayMount()) {
            GTEST_SKIP() << "needs the right to mount";
        }
        enterMountNamespace();
        mountMemory(root.locate(kHome), "256k");
        root.addDirectory(kLibrary);
    }
    void TearDown() override { unmount(root.locate(kHome)); }
};

TEST_F(LocalCredentialStoreOnDiskTest, AFullDiskKeepsWhatWasThere) {
    ASSERT_EQ(create("other", "kept"), 0);

    EXPECT_EQ(create("account", std::string(300000, 'x')), platform::kCredentialWriteFailed);
    EXPECT_EQ(statusOf("account"), platform::kCredentialItemNotFound);
    EXPECT_EQ(secret("other"), "kept");
    expectClean();
    EXPECT_EQ(create("account", "fits"), 0);
}

TEST_F(LocalCredentialStoreOnDiskTest, TheLastItemCanBeDeletedFromAFullDisk) {
    ASSERT_EQ(create("account", "secret"), 0);
    std::ofstream(root.locate("/home/user/filler")) << std::string(300000, 'x');

    EXPECT_EQ(create("other", std::string(20000, 'x')), platform::kCredentialWriteFailed);
    EXPECT_EQ(deleteItem("account"), 0);
    EXPECT_EQ(root.names(kFolder), Names{});
}

TEST_F(LocalCredentialStoreOnDiskTest, AReadOnlyHomeIsReadAndNotWritten) {
    makeReadOnly(root.locate(kHome));
    EXPECT_EQ(create("account", "secret"), platform::kCredentialWriteFailed);
    EXPECT_EQ(statusOf("account"), platform::kCredentialItemNotFound);

    makeReadOnly(root.locate(kHome), false);
    ASSERT_EQ(create("account", "secret"), 0);
    makeReadOnly(root.locate(kHome));
    EXPECT_EQ(secret("account"), "secret");
    EXPECT_EQ(create("other", "secret"), platform::kCredentialWriteFailed);
    EXPECT_EQ(create("account", "secret"), platform::kCredentialDuplicateItem);
    EXPECT_EQ(deleteItem("account"), platform::kCredentialWriteFailed);
    EXPECT_EQ(secret("account"), "secret");
}

TEST_F(LocalCredentialStoreOnDiskTest, AFileThatIsAMountPointIsRewrittenInPlace) {
    ASSERT_EQ(create("one", std::string(5000, '1')), 0);
    mountOnItself(root.locate(kFile));

    EXPECT_EQ(create("two", "second"), 0);
    EXPECT_EQ(secret("one"), std::string(5000, '1'));
    EXPECT_EQ(secret("two"), "second");
    EXPECT_EQ(deleteItem("one"), 0);
    EXPECT_EQ(secret("two"), "second");
    EXPECT_EQ(deleteItem("two"), 0);
    EXPECT_EQ(statusOf("two"), platform::kCredentialItemNotFound);
    expectClean();
    EXPECT_EQ(create("three", "third"), 0);
    EXPECT_EQ(secret("three"), "third");
    unmount(root.locate(kFile));
}

TEST_F(LocalCredentialStoreOnDiskTest, AMountPointWhoseSpaceCannotBeReservedKeepsItsContent) {
    ASSERT_EQ(create("one", "first"), 0);
    mountOnItself(root.locate(kFile));
    const std::string before = root.content(kFile).value_or("");
    SystemCallFaults::count();
    ASSERT_EQ(create("two", "second"), 0);
    const Names calls = SystemCallFaults::stop();
    const auto reservation = std::find(calls.begin(), calls.end(), "posix_fallocate");
    ASSERT_NE(reservation, calls.end());
    ASSERT_EQ(deleteItem("two"), 0);
    ASSERT_EQ(root.content(kFile), before);

    SystemCallFaults::failAt(static_cast<int>(reservation - calls.begin()) + 1, ENOSPC);
    const std::int32_t status = create("two", "second");
    SystemCallFaults::stop();

    EXPECT_EQ(status, platform::kCredentialWriteFailed);
    EXPECT_EQ(root.content(kFile), before);
    expectClean();
    unmount(root.locate(kFile));
}

TEST_F(LocalCredentialStoreOnDiskTest, AMountPointOnAFullDiskKeepsItsContent) {
    ASSERT_EQ(create("one", "first"), 0);
    mountOnItself(root.locate(kFile));
    const std::string before = root.content(kFile).value_or("");

    // Fits once beside the old content, but not twice.
    EXPECT_EQ(create("two", std::string(120000, '2')), platform::kCredentialWriteFailed);
    EXPECT_EQ(root.content(kFile), before);
    expectClean();
    unmount(root.locate(kFile));
}

} // namespace welcomer::local
