// Which service is a switch of an online account, and what happens where there is none.

#include "backends/desktop/accounts/OnlineAccountService.h"
#include "tests/contract/OnlineAccountBackend.h"
#include "tests/contract/TimeBackends.h"
#include "tests/fakes/FakeOnlineAccounts.h"

#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace welcomer::contract {
namespace {

using namespace platform;
using desktop::OnlineAccount;
using desktop::OnlineFeature;
using Names = std::vector<std::string>;

const std::vector<std::pair<std::string, OnlineFeature>> kSwitchesOfTheCloud = {
    {kSKServiceIDContacts, OnlineFeature::Contacts},
    {kSKServiceIDCalendars, OnlineFeature::Calendar},
    {kSKServiceMobileDocuments, OnlineFeature::Files},
};

const Names kWithoutSwitch = {kSKServiceIDBookMarks,   kSKServiceIDMediaStream, kSKServiceIDReminders,
                              kSKServiceIDAccountSync, kSKServiceIDNotes,       kSKServiceIDLOC};

class OnlineAccountServiceTest : public testing::Test {
  protected:
    // Bert is nobody's user: his account has all services, and no mail address.
    std::shared_ptr<CloudAccount> bert() { return backend.service.accountForID("bert", true); }
    std::shared_ptr<CloudService> serviceOfBert(const std::string& identifier) {
        return bert()->serviceForID(identifier);
    }
    void enable(const std::string& identifier, bool isOn = true) {
        serviceOfBert(identifier)->enableSilently(isOn);
    }
    bool isEnabled(const std::string& identifier) {
        return backend.service.isServiceEnabled(bert().get(), identifier);
    }
    // What the account file has.
    bool isEnabledInFile(const std::string& identifier) {
        return backend.embedded.service.isServiceEnabled(bert().get(), identifier);
    }
    std::optional<PropertyList> mailAddress() {
        return serviceOfBert(kSKServiceIDMail)->propertyValue(kSKPropertyMailEmailAddress);
    }

    OnlineAccount::Switch switchOf(std::size_t account, OnlineFeature feature) const {
        return online.accounts.at(account).switchOf(feature);
    }
    bool isOn(std::size_t account, OnlineFeature feature) const {
        return switchOf(account, feature).hasInterface;
    }

    // The notifications that come while the loop runs, each as its name and what `look` finds at that moment.
    template <typename Look>
    std::vector<std::pair<std::string, std::string>> signIn(const std::string& name,
                                                            const std::string& password, Look look) {
        std::vector<std::pair<std::string, std::string>> seen;
        std::vector<std::unique_ptr<NotificationObservation>> observations;
        for (const char* end : {kSKNotificationSignInCompleted, kSKNotificationSignInFailed}) {
            observations.push_back(backend.center.addObserver(end, [&](const Notification& notification) {
                EXPECT_EQ(std::this_thread::get_id(), thread);
                seen.emplace_back(notification.name, look());
            }));
        }
        backend.service.finishSignIn(name, password, {});
        backend.time.runLoops.current()->run(tooLong);
        return seen;
    }
    std::vector<std::pair<std::string, std::string>> signIn(const std::string& name,
                                                            const std::string& password) {
        return signIn(name, password, [] { return ""; });
    }
    std::string loggedIn() {
        const auto account = backend.service.loggedInAccount();
        return account ? account->accountID() : "nobody";
    }

    const std::thread::id thread = std::this_thread::get_id();
    fakes::FakeOnlineAccounts online;
    bool isThere = true;
    int askedFor = 0;
    OnlineAccountBackend<SimulatedTime> backend{[this]() -> desktop::OnlineAccounts* {
                                                    ++askedFor;
                                                    return isThere ? &online : nullptr;
                                                },
                                                {"owncloud", "https://cloud.example/"}};
};

TEST_F(OnlineAccountServiceTest, ContactsCalendarsAndDocumentsAreSwitchesOfTheOnlineAccount) {
    online.add("owncloud", "bert", false);
    for (const auto& [identifier, feature] : kSwitchesOfTheCloud) {
        SCOPED_TRACE(identifier);
        EXPECT_FALSE(isEnabled(identifier));
        enable(identifier);
        EXPECT_TRUE(isOn(0, feature));
        EXPECT_TRUE(isEnabled(identifier));
        for (const auto& [other, otherFeature] : kSwitchesOfTheCloud) {
            EXPECT_EQ(isOn(0, otherFeature), otherFeature == feature) << other;
        }
        serviceOfBert(identifier)->enableWithWindow(false, false, nullptr);
        EXPECT_FALSE(isOn(0, feature));
        EXPECT_FALSE(isEnabled(identifier));
    }
}

TEST_F(OnlineAccountServiceTest, MailIsTheSwitchOfTheMailAccountOfTheSameIdentity) {
    online.add("owncloud", "bert", false);
    online.add("imap_smtp", "anna", false);
    online.add("imap_smtp", "bert", false);
    enable(kSKServiceIDMail);
    EXPECT_FALSE(isOn(1, OnlineFeature::Mail));
    EXPECT_TRUE(isOn(2, OnlineFeature::Mail));
    EXPECT_TRUE(isEnabled(kSKServiceIDMail));
    EXPECT_EQ(online.writes, 1);
}

TEST_F(OnlineAccountServiceTest, WhatIsSwitchedElsewhereIsWhatCounts) {
    online.add("owncloud", "bert", true);
    EXPECT_TRUE(isEnabled(kSKServiceIDContacts));
    EXPECT_FALSE(isEnabledInFile(kSKServiceIDContacts));
    enable(kSKServiceIDContacts);
    ASSERT_TRUE(online.setFeature(online.accounts[0], OnlineFeature::Contacts, false));
    EXPECT_FALSE(isEnabled(kSKServiceIDContacts));
    EXPECT_TRUE(isEnabledInFile(kSKServiceIDContacts));
}

TEST_F(OnlineAccountServiceTest, ASwitchThatIsOffAlreadyCountsAsOffWhileItsInterfaceIsStillThere) {
    online.add("owncloud", "bert", true).switches[0] = {true, true};
    EXPECT_FALSE(isEnabled(kSKServiceIDContacts));
}

TEST_F(OnlineAccountServiceTest, ASwitchWithoutAnEffectIsLeftAloneAndTheAccountFileHasTheWord) {
    online.add("owncloud", "bert", false); // knows no mail
    enable(kSKServiceIDMail);
    EXPECT_EQ(online.writes, 0);
    EXPECT_TRUE(isEnabled(kSKServiceIDMail));
    enable(kSKServiceIDMail, false);
    EXPECT_EQ(online.writes, 0);
    EXPECT_FALSE(isEnabled(kSKServiceIDMail));
}

TEST_F(OnlineAccountServiceTest, ASwitchThatTurnsOutToHaveNoEffectLeavesTheWordToTheAccountFile) {
    online.add("owncloud", "bert", false).switches[3] = {true, false}; // somebody has written mail's
    EXPECT_FALSE(isEnabled(kSKServiceIDMail));
    enable(kSKServiceIDMail);
    EXPECT_FALSE(isOn(0, OnlineFeature::Mail));
    EXPECT_TRUE(isEnabled(kSKServiceIDMail));
}

TEST_F(OnlineAccountServiceTest, WhatTheOnlineAccountsDoNotKnowStaysInTheAccountFile) {
    online.add("owncloud", "bert", false);
    for (const std::string& identifier : kWithoutSwitch) {
        SCOPED_TRACE(identifier);
        EXPECT_FALSE(isEnabled(identifier));
        enable(identifier);
        EXPECT_TRUE(isEnabled(identifier));
        EXPECT_TRUE(isEnabledInFile(identifier));
    }
    EXPECT_EQ(online.writes, 0);
    EXPECT_EQ(online.questions, 0);
}

TEST_F(OnlineAccountServiceTest, ASwitchThatStandsAlreadyIsNotWritten) {
    online.add("owncloud", "bert", true);
    enable(kSKServiceIDContacts);
    EXPECT_EQ(online.writes, 0);
    enable(kSKServiceIDContacts, false);
    enable(kSKServiceIDContacts, false);
    EXPECT_EQ(online.writes, 1);
}

TEST_F(OnlineAccountServiceTest, AnotherIdentitysAccountStaysAsItIs) {
    online.add("owncloud", "anna", false);
    enable(kSKServiceIDContacts);
    EXPECT_EQ(online.writes, 0);
    EXPECT_TRUE(isEnabled(kSKServiceIDContacts));
}

TEST_F(OnlineAccountServiceTest, OfSeveralAccountsTheOneThatWasMadeFirstCounts) {
    online.add("owncloud", "bert", false);
    online.add("owncloud", "bert", true);
    EXPECT_FALSE(isEnabled(kSKServiceIDContacts));
    enable(kSKServiceIDContacts);
    EXPECT_TRUE(isOn(0, OnlineFeature::Contacts));
    enable(kSKServiceIDContacts, false);
    EXPECT_FALSE(isOn(0, OnlineFeature::Contacts));
    EXPECT_TRUE(isOn(1, OnlineFeature::Contacts));
    EXPECT_FALSE(isEnabled(kSKServiceIDContacts));
}

TEST_F(OnlineAccountServiceTest, TheCloudsOwnProviderComesBeforeAnOlderOne) {
    online.add("google", "bert", false);
    online.add("owncloud", "bert", false);
    online.add("imap_smtp", "bert", false);
    enable(kSKServiceIDContacts);
    enable(kSKServiceIDMail);
    EXPECT_FALSE(isOn(0, OnlineFeature::Contacts));
    EXPECT_TRUE(isOn(1, OnlineFeature::Contacts));
    EXPECT_FALSE(isOn(0, OnlineFeature::Mail));
    EXPECT_TRUE(isOn(2, OnlineFeature::Mail));
}

TEST_F(OnlineAccountServiceTest, AnotherProvidersAccountServesWhereItIsTheOnlyOne) {
    online.add("google", "bert", false);
    enable(kSKServiceIDContacts);
    enable(kSKServiceIDMail);
    EXPECT_TRUE(isOn(0, OnlineFeature::Contacts));
    EXPECT_TRUE(isOn(0, OnlineFeature::Mail));
}

TEST_F(OnlineAccountServiceTest, AServiceThatTheCloudAccountDoesNotHaveIsNotThereForASwitch) {
    backend.addUser("anna", "secret"); // contacts and mail alone
    online.add("owncloud", "anna", true);
    const auto anna = backend.service.accountForID("anna", true);
    EXPECT_EQ(anna->serviceForID(kSKServiceIDCalendars), nullptr);
    EXPECT_FALSE(backend.service.isServiceEnabled(anna.get(), kSKServiceIDCalendars));
    EXPECT_TRUE(backend.service.isServiceEnabled(anna.get(), kSKServiceIDContacts));
}

TEST_F(OnlineAccountServiceTest, NothingThatIsAskedForIsLostWhereTheSwitchCannotBeWritten) {
    online.add("owncloud", "bert", false);
    online.canWrite = false;
    enable(kSKServiceIDContacts);
    EXPECT_EQ(online.writes, 1);
    EXPECT_TRUE(isEnabledInFile(kSKServiceIDContacts));
    EXPECT_FALSE(isEnabled(kSKServiceIDContacts)); // the switch says so
}

TEST_F(OnlineAccountServiceTest, TheEmbeddedServiceServesAloneWhereNobodyServesTheOnlineAccounts) {
    online.add("owncloud", "bert", false);
    for (const bool hasModule : {true, false}) {
        online.isServing = false;
        isThere = hasModule;
        enable(kSKServiceIDContacts);
        EXPECT_TRUE(isEnabled(kSKServiceIDContacts));
        enable(kSKServiceIDContacts, false);
        EXPECT_FALSE(isEnabled(kSKServiceIDContacts));
    }
    EXPECT_EQ(online.writes, 0);
}

TEST_F(OnlineAccountServiceTest, TheMailAccountInEffectGivesTheAddress) {
    backend.addUser("bert", "secret"); // whose address in the directory is another
    online.add("imap_smtp", "bert", true).mailAddress = "bert@mail.example";
    EXPECT_EQ(mailAddress(), PropertyList("bert@mail.example"));
    EXPECT_EQ(serviceOfBert(kSKServiceIDMail)->propertyValue("other"), std::nullopt);
    EXPECT_EQ(serviceOfBert(kSKServiceIDContacts)->propertyValue(kSKPropertyMailEmailAddress), std::nullopt);
}

TEST_F(OnlineAccountServiceTest, AMailAccountThatIsOffLeavesTheAddressToTheDirectory) {
    backend.addUser("bert", "secret");
    online.add("imap_smtp", "bert", false);
    EXPECT_EQ(mailAddress(), PropertyList("anna@example.org"));
}

TEST_F(OnlineAccountServiceTest, AMailAccountThatIsOffIsKnownByItsAddressWhereTheDirectoryHasNone) {
    OnlineAccount& account = online.add("imap_smtp", "bert", false);
    account.presentationIdentity = "bert@mail.example";
    EXPECT_EQ(mailAddress(), PropertyList("bert@mail.example"));
    for (const char* text : {"Bert's mail", "bert@", "@mail.example", ""}) {
        online.accounts[0].presentationIdentity = text;
        EXPECT_EQ(mailAddress(), std::nullopt) << text;
    }
}

TEST_F(OnlineAccountServiceTest, WithoutAMailAccountTheDirectoryGivesTheAddress) {
    online.add("owncloud", "bert", true);
    EXPECT_EQ(mailAddress(), std::nullopt);
    backend.addUser("anna", "secret");
    EXPECT_EQ(backend.service.accountForID("anna", true)
                  ->serviceForID(kSKServiceIDMail)
                  ->propertyValue(kSKPropertyMailEmailAddress),
              PropertyList("anna@example.org"));
}

TEST_F(OnlineAccountServiceTest, ACompletedSignInMakesTheOnlineAccountBeforeItIsTold) {
    backend.addUser("anna", "secret");
    const auto seen = signIn("anna", "secret", [this] { return std::to_string(online.made.size()); });
    ASSERT_EQ(seen,
              (std::vector<std::pair<std::string, std::string>>{{kSKNotificationSignInCompleted, "1"}}));
    ASSERT_EQ(online.made.size(), 1U);
    EXPECT_EQ(online.made[0].providerType, "owncloud");
    EXPECT_EQ(online.made[0].identity, "anna");
    EXPECT_EQ(online.made[0].password, "secret");
    EXPECT_EQ(online.made[0].serverAddress, "https://cloud.example/");
    EXPECT_EQ(loggedIn(), "anna");
}

TEST_F(OnlineAccountServiceTest, TheOnlineAccountBeginsWithNothingOnButWhatIsEnabledAlready) {
    EXPECT_EQ(signIn("bert", "none").at(0).first, kSKNotificationSignInFailed);
    backend.addUser("anna", "secret");
    backend.service.accountForID("anna", true)->serviceForID(kSKServiceIDContacts)->enableSilently(true);
    signIn("anna", "secret");
    EXPECT_TRUE(isOn(0, OnlineFeature::Contacts));
    EXPECT_FALSE(isOn(0, OnlineFeature::Calendar));
    EXPECT_FALSE(isOn(0, OnlineFeature::Files));
}

TEST_F(OnlineAccountServiceTest, SigningInAgainMakesNoOtherOnlineAccount) {
    backend.addUser("anna", "secret");
    signIn("anna", "secret");
    signIn("anna", "secret");
    EXPECT_EQ(online.made.size(), 1U);
    EXPECT_EQ(loggedIn(), "anna");
}

TEST_F(OnlineAccountServiceTest, AFailedSignInMakesNoOnlineAccount) {
    backend.addUser("anna", "secret");
    EXPECT_EQ(signIn("anna", "wrong").at(0).first, kSKNotificationSignInFailed);
    EXPECT_EQ(online.made.size(), 0U);
    EXPECT_EQ(online.questions, 0);
}

TEST_F(OnlineAccountServiceTest, AuthenticatingMakesNoOnlineAccount) {
    backend.addUser("anna", "secret");
    backend.service.authenticate("anna", "secret", {});
    backend.time.runLoops.current()->run(tooLong);
    EXPECT_EQ(askedFor, 0);
}

TEST_F(OnlineAccountServiceTest, ASignInWhoseOnlineAccountCannotBeMadeCompletesAllTheSame) {
    backend.addUser("anna", "secret");
    online.canWrite = false;
    EXPECT_EQ(signIn("anna", "secret").at(0).first, kSKNotificationSignInCompleted);
    EXPECT_EQ(loggedIn(), "anna");
    EXPECT_TRUE(backend.preferenceStore.stored(desktop::kOnlineAccountsDomain).empty());
    online.isServing = false;
    EXPECT_EQ(signIn("anna", "secret").at(0).first, kSKNotificationSignInCompleted);
    isThere = false;
    EXPECT_EQ(signIn("anna", "secret").at(0).first, kSKNotificationSignInCompleted);
    EXPECT_EQ(loggedIn(), "anna");
}

TEST_F(OnlineAccountServiceTest, WhoRemovesTheOnlineAccountIsNoLongerLoggedIn) {
    backend.addUser("anna", "secret");
    signIn("anna", "secret");
    online.accounts.clear();
    online.add("owncloud", "bert", true);
    online.add("imap_smtp", "anna", true);
    EXPECT_EQ(loggedIn(), "nobody");
    EXPECT_NE(backend.service.accountForID("anna", false), nullptr);
    signIn("anna", "secret");
    EXPECT_EQ(online.made.size(), 2U);
    EXPECT_EQ(loggedIn(), "anna");
}

TEST_F(OnlineAccountServiceTest, TheLogInIsRememberedForOtherProcesses) {
    backend.addUser("anna", "secret");
    signIn("anna", "secret");
    EXPECT_EQ(backend.preferenceStore.stored(desktop::kOnlineAccountsDomain),
              (PropertyList::Dictionary{{"anna", true}}));
}

TEST_F(OnlineAccountServiceTest, WhileNobodyServesTheOnlineAccountsTheLogInStands) {
    backend.addUser("anna", "secret");
    signIn("anna", "secret");
    online.accounts.clear();
    online.isServing = false;
    EXPECT_EQ(loggedIn(), "anna");
    isThere = false;
    EXPECT_EQ(loggedIn(), "anna");
}

TEST_F(OnlineAccountServiceTest, AServiceThatEndsDuringASignInTellsNothing) {
    backend.addUser("anna", "secret");
    int told = 0;
    const auto observation = backend.center.addObserver(
        kSKNotificationSignInCompleted, [&](const Notification& /*notification*/) { ++told; });
    for (const bool isLate : {false, true}) {
        auto another = backend.makeService();
        online.whileMaking = [&] {
            another.reset();
        };
        another->finishSignIn("anna", "secret", {});
        if (!isLate) {
            another.reset();
        }
        backend.time.runLoops.current()->run(tooLong);
        EXPECT_EQ(another, nullptr);
        EXPECT_EQ(told, 0);
    }
    EXPECT_EQ(online.made.size(), 1U);
}

TEST_F(OnlineAccountServiceTest, AnObserverMayStartTheNextSignIn) {
    backend.addUser("anna", "secret");
    Names names;
    std::vector<std::unique_ptr<NotificationObservation>> observations;
    for (const char* end : {kSKNotificationSignInCompleted, kSKNotificationSignInFailed}) {
        observations.push_back(backend.center.addObserver(end, [&](const Notification& notification) {
            names.push_back(notification.name);
            if (names.size() < 3) {
                backend.service.finishSignIn("anna", names.size() == 1 ? "wrong" : "secret", {});
            }
        }));
    }
    backend.service.finishSignIn("anna", "secret", {});
    backend.time.runLoops.current()->run(tooLong);
    EXPECT_EQ(names, (Names{kSKNotificationSignInCompleted, kSKNotificationSignInFailed,
                            kSKNotificationSignInCompleted}));
}

TEST_F(OnlineAccountServiceTest, NobodyAsksForTheOnlineAccountsBeforeTheyAreNeeded) {
    EXPECT_EQ(loggedIn(), "nobody");
    backend.service.markSetupFinished(std::nullopt);
    bert()->suppressFailureDialogs();
    EXPECT_TRUE(serviceOfBert(kSKServiceIDContacts)->canBeEnabled());
    EXPECT_FALSE(backend.service.isServiceEnabled(nullptr, kSKServiceIDContacts));
    EXPECT_EQ(askedFor, 0);
}

} // namespace
} // namespace welcomer::contract
