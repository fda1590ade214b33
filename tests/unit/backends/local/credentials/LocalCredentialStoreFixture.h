// What the tests of credentials in a file share.

#pragma once

#include "backends/local/credentials/LocalCredentialStore.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeFileSystem.h"
#include "tests/fakes/FakeProcessIdentity.h"
#include "tests/support/FindCredential.h"

#include <functional>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>

namespace welcomer::local {

using platform::CredentialItem;
using platform::CredentialItemReference;
using Names = std::vector<std::string>;

inline constexpr char kHome[] = "/home/user";
inline constexpr char kLibrary[] = "/home/user/Library";
inline constexpr char kFolder[] = "/home/user/Library/Credentials";
inline constexpr char kFile[] = "/home/user/Library/Credentials/Items.plist";
inline constexpr char kLeftOver[] = "/home/user/Library/Credentials/.Items.plist.new";

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
inline const std::string kSecret(10000, 's');

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

} // namespace welcomer::local
