// What every directory of accounts and users must do, and the machine's own file of users.

#include "backends/local/accounts/LocalAccountDirectory.h"
#include "backends/local/LocalNotificationCenter.h"
#include "backends/local/accounts/LocalAccountService.h"
#include "backends/local/accounts/NimbusDirectory.h"
#include "propertylist/PropertyListReader.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/contract/TimeBackends.h"
#include "tests/fakes/FakeAccountDirectory.h"
#include "tests/fakes/FakeFileSystem.h"
#include "tests/fakes/FakeNotificationCenter.h"
#include "tests/fakes/FakeProcessIdentity.h"
#include "tests/fakes/FakeSystemLog.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <string>
#include <sys/stat.h>
#include <thread>
#include <type_traits>
#include <vector>

namespace welcomer::contract {
namespace {

using namespace platform;
using Names = std::vector<std::string>;
using Dictionary = PropertyList::Dictionary;

struct Local {
    Local() { root.addDirectory("/home/user/Library"); }
    TemporaryRoot root;
    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem{recorder};
    fakes::FakeProcessIdentity identity{recorder, fileSystem};
    SimulatedTime time;
    local::LocalNotificationCenter center;
    fakes::FakeSystemLog log{recorder};
    local::LocalAccountService service{
        posix::RootFolder(root.path()), identity, time.runLoops, time.dispatchQueues, center, log};
    local::LocalAccountDirectory directory{posix::RootFolder(root.path()), identity, log};
};

struct Fake {
    SimulatedTime time;
    fakes::CallRecorder recorder;
    fakes::FakeNotificationCenter center;
    fakes::FakeAccountService service{recorder, center, time.runLoops, time.dispatchQueues};
    fakes::FakeAccountDirectory directory{service};
};

struct BackendNames {
    template <typename Backend>
    static std::string GetName(int) {
        return std::is_same_v<Backend, Local> ? "Local" : "Fake";
    }
};

template <typename Backend>
class AccountDirectoryContract : public testing::Test {
  protected:
    Backend backend;
};

using Backends = testing::Types<Local, Fake>;
TYPED_TEST_SUITE(AccountDirectoryContract, Backends, BackendNames);

TYPED_TEST(AccountDirectoryContract, NobodyIsThereAtFirst) {
    EXPECT_EQ(this->backend.directory.accounts(), Names{});
    EXPECT_EQ(this->backend.directory.users(), Names{});
}

TYPED_TEST(AccountDirectoryContract, AccountsComeInOrder) {
    this->backend.service.sharedManager().accountForID("bert", true);
    this->backend.service.sharedManager().accountForID("anna", true);
    EXPECT_EQ(this->backend.directory.accounts(), (Names{"anna", "bert"}));
    EXPECT_EQ(this->backend.directory.users(), Names{});
}

TYPED_TEST(AccountDirectoryContract, UsersComeInOrderAndOnceEach) {
    for (const char* name : {"bert", "anna", "bert"}) {
        EXPECT_TRUE(this->backend.directory.storeUser({name, "secret", std::nullopt, {}}));
    }
    EXPECT_EQ(this->backend.directory.users(), (Names{"anna", "bert"}));
    EXPECT_EQ(this->backend.directory.accounts(), Names{});
}

TYPED_TEST(AccountDirectoryContract, OfTwoThatAddAUserOneSucceeds) {
    EXPECT_TRUE(this->backend.directory.addUser({"anna", "secret", std::nullopt, {}}));
    const Outcome outcome = this->backend.directory.addUser({"anna", "other", std::nullopt, {}});
    EXPECT_FALSE(outcome);
    EXPECT_EQ(outcome.error.number, EEXIST);
    EXPECT_EQ(this->backend.directory.users(), Names{"anna"});
}

TYPED_TEST(AccountDirectoryContract, ARemovedUserIsGoneOnce) {
    EXPECT_TRUE(this->backend.directory.addUser({"anna", "secret", std::nullopt, {}}));
    EXPECT_TRUE(this->backend.directory.addUser({"bert", "secret", std::nullopt, {}}));
    EXPECT_TRUE(this->backend.directory.removeUser("anna"));
    EXPECT_EQ(this->backend.directory.users(), Names{"bert"});
    EXPECT_EQ(this->backend.directory.removeUser("anna").error.number, ENOENT);
    EXPECT_TRUE(this->backend.directory.removeUser("bert"));
    EXPECT_EQ(this->backend.directory.users(), Names{});
}

TYPED_TEST(AccountDirectoryContract, ARemovedAccountIsGoneOnceAndTheOthersStay) {
    this->backend.service.sharedManager().accountForID(PropertyList("anna"), true);
    this->backend.service.sharedManager().accountForID(PropertyList("bert"), true);
    EXPECT_TRUE(this->backend.directory.removeAccount("anna"));
    EXPECT_EQ(this->backend.directory.accounts(), Names{"bert"});
    EXPECT_EQ(this->backend.directory.removeAccount("anna").error.number, ENOENT);
}

TYPED_TEST(AccountDirectoryContract, WhereNobodyIsLoggedInNobodyIsSignedOut) {
    this->backend.service.sharedManager().accountForID(PropertyList("anna"), true);
    EXPECT_EQ(this->backend.directory.signOut().error.number, ENOENT);
    EXPECT_EQ(this->backend.directory.accounts(), Names{"anna"});
}

class LocalAccountDirectoryTest : public testing::Test {
  protected:
    SignInAnswer answer(const std::string& name, const std::string& password) const {
        return local::NimbusDirectory(posix::RootFolder(local.root.path())).answer(name, password, {});
    }
    mode_t mode(const std::string& path) const {
        struct stat status = {};
        EXPECT_EQ(::stat(local.root.locate(path).c_str(), &status), 0);
        return status.st_mode & 07777U;
    }
    const CloudUser anna{"anna", "secret", "anna@example.org", {{"status", 0}, {"delegates", Dictionary{}}}};
    Local local;
};

TEST_F(LocalAccountDirectoryTest, AStoredUserCanSignInWithThePasswordAloneAndGetsTheResponse) {
    ASSERT_TRUE(local.directory.storeUser(anna));
    EXPECT_TRUE(answer("anna", "secret").isCompleted);
    EXPECT_EQ(answer("anna", "secret").contents,
              (Dictionary{{"status", 0}, {"delegates", Dictionary{}}, {kSKPropertyAccountID, "anna"}}));
    EXPECT_FALSE(answer("anna", "Secret").isCompleted);
    EXPECT_FALSE(answer("bert", "secret").isCompleted);
}

TEST_F(LocalAccountDirectoryTest, TheMailAddressGoesToTheUsersAccount) {
    ASSERT_TRUE(local.directory.storeUser(anna));
    EXPECT_EQ(local.service.accountForID("anna", true)
                  ->serviceForID(kSKServiceIDMail)
                  ->propertyValue(kSKPropertyMailEmailAddress),
              PropertyList("anna@example.org"));
}

TEST_F(LocalAccountDirectoryTest, AStoredUserReplacesAllThatWasThereAboutIt) {
    ASSERT_TRUE(local.directory.storeUser(anna));
    ASSERT_TRUE(local.directory.storeUser({"anna", "other", std::nullopt, {{"status", 2}}}));
    EXPECT_FALSE(answer("anna", "secret").isCompleted);
    EXPECT_EQ(answer("anna", "other").contents, (Dictionary{{"status", 2}, {kSKPropertyAccountID, "anna"}}));
    EXPECT_EQ(local.service.accountForID("anna", true)
                  ->serviceForID(kSKServiceIDMail)
                  ->propertyValue(kSKPropertyMailEmailAddress),
              std::nullopt);
}

TEST_F(LocalAccountDirectoryTest, AUserWhoIsThereKeepsThePasswordWhenAddedAgain) {
    ASSERT_TRUE(local.directory.addUser(anna));
    ASSERT_FALSE(local.directory.addUser({"anna", "other", std::nullopt, {}}));
    EXPECT_TRUE(answer("anna", "secret").isCompleted);
}

TEST_F(LocalAccountDirectoryTest, AValueThatXMLCannotHoldIsTheReason) {
    const Outcome outcome = local.directory.addUser({"anna", "secret", "a\x01", {}});
    EXPECT_FALSE(outcome);
    EXPECT_EQ(outcome.error.message, "cannot write " + local.root.locate(local::kNimbusDirectoryPath) +
                                         ": Users/anna/MailAddress holds U+0001, for which XML has no place");
}

TEST_F(LocalAccountDirectoryTest, ThePasswordIsNotInTheFileWhichIsItsOwnersAlone) {
    ASSERT_TRUE(local.directory.storeUser(anna));
    EXPECT_EQ(mode(local::kNimbusDirectoryPath), 0600U);
    EXPECT_EQ(mode("/var/lib/welcomer"), 0755U);
    const std::string content = local.root.content(local::kNimbusDirectoryPath).value();
    EXPECT_EQ(content.find("secret"), std::string::npos);
    EXPECT_NE(content.find("$y$"), std::string::npos);
}

TEST_F(LocalAccountDirectoryTest, ADamagedDirectoryStaysAsItIs) {
    for (const char* content : {"<plist><dict><key>torn", "{ Users = none; }"}) {
        local.root.addFile(local::kNimbusDirectoryPath, content);
        EXPECT_EQ(local.directory.users(), std::nullopt);
        const Outcome outcome = local.directory.storeUser(anna);
        EXPECT_FALSE(outcome);
        EXPECT_NE(outcome.error.message.find("nimbus-directory.plist: "), std::string::npos)
            << outcome.error.message;
        EXPECT_EQ(local.root.content(local::kNimbusDirectoryPath), content);
    }
}

TEST_F(LocalAccountDirectoryTest, WhatCannotBeWrittenSaysWhy) {
    local.root.addFile("/var/lib/welcomer", "a file in the folder's place");
    const Outcome outcome = local.directory.storeUser(anna);
    EXPECT_FALSE(outcome);
    EXPECT_NE(outcome.error.message.find("Not a directory"), std::string::npos) << outcome.error.message;
}

TEST_F(LocalAccountDirectoryTest, APasswordThatCannotBeHashedIsRefused) {
    EXPECT_FALSE(local.directory.storeUser({"anna", std::string("a\0b", 3), std::nullopt, {}}));
    EXPECT_EQ(local.directory.users(), Names{});
}

TEST_F(LocalAccountDirectoryTest, NoUserOfAnotherThreadIsLost) {
    std::vector<std::thread> threads;
    Names names;
    for (int i = 0; i < 4; ++i) {
        names.push_back("user" + std::to_string(i));
        threads.emplace_back([this, name = names.back()] {
            EXPECT_TRUE(local.directory.storeUser({name, "secret", std::nullopt, {}}));
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(local.directory.users(), names);
}

TEST_F(LocalAccountDirectoryTest, AnAccountThatIsNoDictionaryIsNone) {
    local.root.addFile("/home/user/Library/Accounts/Accounts.plist",
                       "{ Accounts = { anna = { }; bert = text; }; }");
    EXPECT_EQ(local.directory.accounts(), Names{"anna"});
    local.root.addFile("/home/user/Library/Accounts/Accounts.plist", "{ Accounts = text; }");
    EXPECT_EQ(local.directory.accounts(), Names{});
}

} // namespace
} // namespace welcomer::contract
