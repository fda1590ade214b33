#include "agent/wlnimbussetup_RemainingSkylarkSetup.h"

#include "cloud/WLNimbusServiceCatalogue.h"
#include "tests/fakes/FakePlatform.h"

#include <algorithm>
#include <chrono>
#include <functional>
#include <gtest/gtest.h>
#include <stdexcept>
#include <string>
#include <vector>

namespace welcomer {
namespace {

using namespace std::chrono_literals;
using Strings = std::vector<std::string>;

class RemainingSkylarkSetupTest : public testing::Test {
  protected:
    RemainingSkylarkSetupTest() {
        setKillall([] { return 0; });
        for (const std::string& identifier : WLNimbusAllSetupServiceIDs()) {
            fake.accountService.servicesOfNewAccounts[identifier] = {};
        }
        fake.accountService.servicesOfNewAccounts[platform::kSKServiceIDMail].properties = {
            {platform::kSKPropertyMailEmailAddress, "anna@example.org"}};
    }

    void setKillall(std::function<int()> run) {
        fake.processLauncher.programs["/usr/bin/killall"] = [run](const auto&) {
            return run();
        };
    }

    void run(const std::string& accountName = "anna") {
        wlnimbussetup_RemainingSkylarkSetup(accountName, fake.virtualTime.createGroup());
    }

    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
};

TEST_F(RemainingSkylarkSetupTest, EndsThePreferenceProcessBeforeTheAccountIsTouched) {
    run();
    const Strings calls = fake.recorder.calls();
    ASSERT_GE(calls.size(), 4U);
    EXPECT_EQ(Strings(calls.begin(), calls.begin() + 4),
              (Strings{"SystemLog.write 115, Killing onlineaccounts",
                       "ProcessLauncher.launchAndWait /usr/bin/killall, -9, com.corvid.onlineaccounts",
                       "SystemLog.write 115, Enabling post-login services for account anna",
                       "AccountManager.accountForID anna, yes"}));
}

TEST_F(RemainingSkylarkSetupTest, EnablesThePostLoginServicesAndNoOthersSilently) {
    run();
    fake.virtualTime.sleep(3s);
    Strings enabled;
    for (const auto& [identifier, service] : fake.accountService.accounts["anna"]) {
        if (service.enabled) {
            enabled.push_back(identifier);
        }
    }
    Strings postLogin = WLNimbusPostLoginServiceIDs();
    std::sort(postLogin.begin(), postLogin.end());
    EXPECT_EQ(enabled, postLogin);
    EXPECT_EQ(fake.recorder.callsTo("CloudService.enableWithWindow"), Strings{});
}

TEST_F(RemainingSkylarkSetupTest, NothingCountsAsOptedOut) {
    run();
    for (const std::string& line : fake.systemLog.lines()) {
        EXPECT_EQ(line.find("opted out"), std::string::npos) << line;
    }
}

TEST_F(RemainingSkylarkSetupTest, APreferenceProcessThatIsNotRunningIsNotLogged) {
    setKillall([] { return 1; });
    run();
    EXPECT_EQ(fake.systemLog.lines()[1], "Enabling post-login services for account anna");
}

TEST_F(RemainingSkylarkSetupTest, AFailureToLaunchIsLoggedAndTheServicesAreEnabled) {
    fake.processLauncher.programs.clear();
    run();
    const Strings lines = fake.systemLog.lines();
    EXPECT_EQ(lines[1], "Exception killing onlineaccounts: /usr/bin/killall: No such file or directory");
    EXPECT_EQ(lines[2], "Enabling post-login services for account anna");
    EXPECT_TRUE(fake.accountService.accounts["anna"][platform::kSKServiceIDContacts].enabled);
}

TEST_F(RemainingSkylarkSetupTest, EveryStandardExceptionIsLoggedAndTheServicesAreEnabled) {
    setKillall([]() -> int { throw std::logic_error("not now"); });
    run();
    EXPECT_EQ(fake.systemLog.lines()[1], "Exception killing onlineaccounts: not now");
    EXPECT_TRUE(fake.accountService.accounts["anna"][platform::kSKServiceIDContacts].enabled);
}

TEST_F(RemainingSkylarkSetupTest, AnyOtherKindOfFailureIsNotCaught) {
    setKillall([]() -> int { throw 42; });
    EXPECT_THROW(run(), int);
    EXPECT_EQ(fake.systemLog.lines(), Strings{"Killing onlineaccounts"});
}

TEST_F(RemainingSkylarkSetupTest, AnEmptyAccountNameIsPassedThroughUnchanged) {
    run("");
    EXPECT_EQ(fake.systemLog.lines(),
              (Strings{"Killing onlineaccounts", "Enabling post-login services for account ",
                       "Failed to retrieve SK_Account"}));
    EXPECT_EQ(fake.recorder.callsTo("AccountManager."), Strings{"AccountManager.accountForID , yes"});
}

TEST_F(RemainingSkylarkSetupTest, TheGroupIsNeitherEnteredNorLeft) {
    const auto group = fake.virtualTime.createGroup();
    wlnimbussetup_RemainingSkylarkSetup("anna", group);
    EXPECT_TRUE(group->wait(0ns));
}

} // namespace
} // namespace welcomer
