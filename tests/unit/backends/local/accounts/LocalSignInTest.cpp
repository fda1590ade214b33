// Signing in on the local platform, with real time.

#include "backends/local/LocalPlatform.h"
#include "cloud/NimbusTesselDelegate.h"
#include "cloud/WLNimbusServiceCatalogue.h"
#include "cloud/WLNimbusSetupWithDictionary.h"
#include "propertylist/PropertyListWriter.h"
#include "tests/unit/backends/local/accounts/LocalAccountServiceFixture.h"

#include <chrono>
#include <string>
#include <thread>
#include <vector>

namespace welcomer {
namespace {

class LocalSignInTest : public LocalAccountServiceTest {
  protected:
    LocalSignInTest() : owner({root.path(), &log}), installed(owner.platform()) {
        root.addDirectory(owner.platform().processIdentity.homeDirectory() + "/Library");
    }

    std::vector<std::string> enabled() {
        std::vector<std::string> result;
        AccountService& accounts = owner.platform().accountService;
        const auto account = accounts.sharedManager().accountForID("anna", false);
        for (const std::string& identifier : WLNimbusAllSetupServiceIDs()) {
            if (accounts.isServiceEnabled(account.get(), identifier)) {
                result.push_back(identifier);
            }
        }
        return result;
    }

    local::LocalPlatform owner;
    ScopedPlatform installed;
};

TEST_F(LocalSignInTest, SigningInAndCompletingEnablesThePreLoginServicesForReal) {
    addUser("anna",
            {{"DelaySeconds", 0.15}, {"Response", Dictionary{{"status", 0}, {"delegates", Dictionary{}}}}});
    NimbusTesselDelegate delegate;
    const auto before = std::chrono::steady_clock::now();
    EXPECT_TRUE(delegate.signInWithUsernameAndPasswordAdditionalDelegatesOmittingDelegatesError(
        "anna", "secret", {}, {}, nullptr));
    EXPECT_GE(std::chrono::steady_clock::now() - before, 150ms);
    EXPECT_EQ(delegate.delegatesResponseDict()->at("delegates"), PropertyList(Dictionary{}));
    EXPECT_TRUE(delegate.completeSetupWithUsernamePasswordNimbusDictionarySelectedServicesWindowError(
        "anna", "secret", {}, WLNimbusAllSetupServiceIDs(), nullptr, nullptr));
    EXPECT_EQ(enabled(), (Names{kSKServiceIDMediaStream, kSKServiceIDAccountSync, kSKServiceIDLOC,
                                kSKServiceMobileDocuments}));
    for (const std::string& line : log.lines()) {
        EXPECT_EQ(line.find("secret"), std::string::npos) << line;
    }
}

TEST_F(LocalSignInTest, AWrongPasswordIsAFalseResult) {
    NimbusTesselDelegate delegate;
    EXPECT_FALSE(delegate.validateNimbusUsernameAndPasswordError("anna", "wrong", nullptr));
    EXPECT_FALSE(delegate.needsRepair());
}

TEST_F(LocalSignInTest, ADelayedEnablingWhoseProcessEndsFirstNeverHappens) {
    const pid_t child = start([&] {
        return WLNimbusSetupWithDictionary2({{kSKPropertyAccountID, "anna"}}, WLNimbusAllSetupServiceIDs(),
                                            false, true, nullptr, nullptr)
                   ? 0
                   : 1;
    });
    EXPECT_EQ(waitFor(child), 0);
    EXPECT_EQ(enabled(), (Names{kSKServiceIDContacts, kSKServiceIDBookMarks}));
}

TEST_F(LocalSignInTest, ADelayedEnablingOfAProcessThatLivesLongEnoughHappens) {
    const std::string preferences =
        owner.platform().processIdentity.homeDirectory() + "/Library/Preferences/com.corvid.welcomer.plist";
    root.addFile(preferences, *writeXMLPropertyList(Dictionary{{"WLDebugPostLoginDelay", 1}}));
    const auto before = std::chrono::steady_clock::now();
    EXPECT_TRUE(WLNimbusSetupWithDictionary2({{kSKPropertyAccountID, "anna"}}, {kSKServiceIDCalendars}, false,
                                             true, nullptr, nullptr));
    EXPECT_EQ(enabled(), Names{});
    while (enabled().empty() && std::chrono::steady_clock::now() - before < 60s) {
        std::this_thread::sleep_for(10ms);
    }
    EXPECT_EQ(enabled(), Names{kSKServiceIDCalendars});
    EXPECT_GE(std::chrono::steady_clock::now() - before, 1s);
}

} // namespace
} // namespace welcomer
