#include "cloud/WLLoggedInNimbusAccount.h"

#include "cloud/WLNimbusServiceCatalogue.h"
#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace welcomer {
namespace {

using Strings = std::vector<std::string>;

class WLLoggedInNimbusAccountTest : public testing::Test {
  protected:
    // Logs an account in that has every service and none enabled.
    void logIn() {
        for (const std::string& identifier : WLNimbusAllSetupServiceIDs()) {
            fake.accountService.accounts["anna"][identifier] = {};
        }
        fake.accountService.loggedIn = "anna";
    }

    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
};

TEST_F(WLLoggedInNimbusAccountTest, IsNoneWhenNobodyIsLoggedIn) {
    EXPECT_EQ(WLLoggedInNimbusAccount(), nullptr);
    EXPECT_FALSE(WLHasLoggedInNimbusAccount());
}

TEST_F(WLLoggedInNimbusAccountTest, IsTheOneThatTheAccountServiceReports) {
    logIn();
    ASSERT_NE(WLLoggedInNimbusAccount(), nullptr);
    EXPECT_EQ(WLLoggedInNimbusAccount()->accountID(), "anna");
    EXPECT_TRUE(WLHasLoggedInNimbusAccount());
}

TEST_F(WLLoggedInNimbusAccountTest, NoServicesAreEnabledAfterAllTenWereAskedInOrder) {
    logIn();
    EXPECT_TRUE(WLNoNimbusServicesEnabled());
    Strings expected{"AccountService.loggedInAccount"};
    for (const std::string& identifier : WLNimbusAllSetupServiceIDs()) {
        expected.push_back("AccountService.isServiceEnabled anna, " + identifier);
    }
    EXPECT_EQ(fake.recorder.calls(), expected);
}

TEST_F(WLLoggedInNimbusAccountTest, AnyOneOfTheTenServicesCounts) {
    for (const std::string& identifier : WLNimbusAllSetupServiceIDs()) {
        logIn();
        fake.accountService.accounts["anna"][identifier].enabled = true;
        EXPECT_FALSE(WLNoNimbusServicesEnabled()) << identifier;
    }
}

TEST_F(WLLoggedInNimbusAccountTest, TheFirstEnabledServiceEndsTheQuestions) {
    logIn();
    fake.accountService.accounts["anna"][platform::kSKServiceIDContacts].enabled = true;
    EXPECT_FALSE(WLNoNimbusServicesEnabled());
    EXPECT_EQ(fake.recorder.callsTo("AccountService.isServiceEnabled").size(), 1U);
}

TEST_F(WLLoggedInNimbusAccountTest, WithoutAnAccountTheAccountServicesAnswersDecide) {
    EXPECT_TRUE(WLNoNimbusServicesEnabled());
    EXPECT_EQ(fake.recorder.callsTo("AccountService.isServiceEnabled (none), ").size(), 10U);
    fake.accountService.enabledWithoutAccount = true;
    EXPECT_FALSE(WLNoNimbusServicesEnabled());
}

} // namespace
} // namespace welcomer
