// Which service is a switch of an online account, and what happens where there is none.

#include "tests/unit/backends/desktop/accounts/OnlineAccountServiceFixture.h"

#include <optional>
#include <string>

namespace welcomer::contract {
namespace {

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

TEST_F(OnlineAccountServiceTest, ASwitchThatWasNotTakenIsSetWhenTheAccountIsNextSetUpAndThenIsTheUsers) {
    online.add("owncloud", "bert", false);
    online.canWrite = false;
    enable(kSKServiceIDContacts);
    online.canWrite = true;
    EXPECT_FALSE(isOn(0, OnlineFeature::Contacts));

    const auto next = backend.makeService();
    next->accountForID("bert", false);
    EXPECT_FALSE(isOn(0, OnlineFeature::Contacts)); // only looked at
    next->accountForID("bert", true);
    EXPECT_TRUE(isOn(0, OnlineFeature::Contacts));

    online.accounts[0].switches[0] = {true, false};
    next->accountForID("bert", true);
    EXPECT_FALSE(isOn(0, OnlineFeature::Contacts));
}

TEST_F(OnlineAccountServiceTest, WhileNobodyServesOnlyTheSwitchesOfAnAccountThatWasMadeAreRemembered) {
    backend.addUser("anna", "secret");
    signIn("anna", "secret");
    online.add("owncloud", "bert", false);
    const auto anna = backend.service.accountForID("anna", true);
    for (const bool isWanted : {true, false, true}) {
        online.isServing = false;
        enable(kSKServiceIDContacts, isWanted);
        anna->serviceForID(kSKServiceIDContacts)->enableSilently(!isWanted);
        anna->serviceForID(kSKServiceIDContacts)->enableSilently(isWanted); // the last word counts
        online.isServing = true;
        bert();
        backend.service.accountForID("anna", true);
        EXPECT_EQ(isOn(0, OnlineFeature::Contacts), isWanted);
        EXPECT_FALSE(isOn(1, OnlineFeature::Contacts));
    }
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

} // namespace
} // namespace welcomer::contract
