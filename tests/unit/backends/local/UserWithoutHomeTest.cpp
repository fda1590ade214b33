// What lies in a user's home, for a user who has none: nothing is there, and nothing is made elsewhere.

#include "backends/local/accounts/AccountFile.h"
#include "backends/local/credentials/LocalCredentialStore.h"
#include "backends/local/preferences/LocalPreferenceStore.h"
#include "platform/CredentialStore.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeFileSystem.h"
#include "tests/fakes/FakeProcessIdentity.h"
#include "tests/fakes/FakeSystemLog.h"
#include "tests/support/FindCredential.h"

#include <gtest/gtest.h>

namespace welcomer::local {
namespace {

using Names = std::vector<std::string>;

class UserWithoutHomeTest : public testing::Test {
  protected:
    UserWithoutHomeTest() { identity.setHomeDirectory(""); }
    ~UserWithoutHomeTest() override { EXPECT_EQ(root.names("/"), Names{}); }

    TemporaryRoot root;
    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem{recorder};
    fakes::FakeProcessIdentity identity{recorder, fileSystem};
    fakes::FakeSystemLog log{recorder};
    const posix::RootFolder rootFolder{root.path()};
};

TEST_F(UserWithoutHomeTest, TheCredentialStoreSaysSo) {
    LocalCredentialStore store(rootFolder, identity);
    EXPECT_EQ(store.createItem({"service", "account", "label", std::nullopt}, "secret"),
              platform::kCredentialNoHome);
    EXPECT_EQ(findCredential(store, nullptr, nullptr), platform::kCredentialNoHome);
    EXPECT_EQ(platform::credentialStatusText(platform::kCredentialNoHome), "the user has no home folder");
}

TEST_F(UserWithoutHomeTest, PreferencesAreEmptyAndCannotBeStored) {
    LocalPreferenceStore store(rootFolder, identity, log);
    EXPECT_EQ(store.copyValue("Key", "org.example"), std::nullopt);
    EXPECT_FALSE(store.synchronise("org.example"));
    store.setValue("Key", 1, "org.example");
    EXPECT_FALSE(store.synchronise("org.example"));
    EXPECT_EQ(store.copyValue("Key", "org.example"), PropertyList(1));
}

TEST_F(UserWithoutHomeTest, ThereAreNoAccountsAndNoneCanBeStored) {
    AccountFile file(rootFolder, identity, log);
    EXPECT_EQ(file.names(), Names{});
    EXPECT_FALSE(file.change([](PropertyList::Dictionary&) { return true; }));
    EXPECT_EQ(file.names(), Names{});
}

} // namespace
} // namespace welcomer::local
