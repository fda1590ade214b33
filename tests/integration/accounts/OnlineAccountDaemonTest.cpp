// The account service and the real daemon.

#include "tests/integration/accounts/OnTheDaemon.h"
#include "tests/integration/accounts/OnlineAccountsBus.h"

#include <string>
#include <thread>
#include <unistd.h>
#include <vector>

namespace welcomer {
namespace {

struct Switch {
    const char* service;
    const char* property;
    const char* interface;
};
constexpr Switch kSwitches[] = {{kSKServiceIDContacts, "ContactsDisabled", "Contacts"},
                                {kSKServiceIDCalendars, "CalendarDisabled", "Calendar"},
                                {kSKServiceMobileDocuments, "FilesDisabled", "Files"},
                                {kSKServiceIDMail, "MailDisabled", "Mail"}};

TEST_F(OnlineAccountDaemon, EachSwitchTakesEffectAndGoesBack) {
    OnlineAccountsBus bus;
    const std::string cloud = bus.addCloudAccount("bert", false);
    const std::string mail = bus.addMailAccount("bert", "bert@mail.example", false);
    for (const auto& [service, property, interface] : kSwitches) {
        SCOPED_TRACE(service);
        const std::string& path = service == std::string(kSKServiceIDMail) ? mail : cloud;
        EXPECT_FALSE(isEnabled(service));
        enable(service);
        EXPECT_EQ(bus.property(path, property), "false");
        EXPECT_TRUE(bus.hasInterface(path, interface));
        EXPECT_TRUE(isEnabled(service));
        enable(service, false);
        EXPECT_EQ(bus.property(path, property), "true");
        EXPECT_FALSE(bus.hasInterface(path, interface));
        EXPECT_FALSE(isEnabled(service));
    }
}

TEST_F(OnlineAccountDaemon, TheMailAccountGivesTheAddressWhetherItIsOnOrOff) {
    OnlineAccountsBus bus;
    const std::string path = bus.addMailAccount("bert", "bert@mail.example", false);
    const auto address = [&] {
        return bert()->serviceForID(kSKServiceIDMail)->propertyValue(kSKPropertyMailEmailAddress);
    };
    EXPECT_EQ(address(), PropertyList("bert@mail.example"));
    enable(kSKServiceIDMail);
    ASSERT_TRUE(bus.hasInterface(path, "Mail"));
    EXPECT_EQ(address(), PropertyList("bert@mail.example"));
}

TEST_F(OnlineAccountDaemon, WithoutAMailAccountMailStaysInTheAccountFile) {
    OnlineAccountsBus bus;
    const std::string path = bus.addCloudAccount("bert", true);
    enable(kSKServiceIDMail);
    EXPECT_TRUE(isEnabled(kSKServiceIDMail));
    enable(kSKServiceIDMail, false);
    EXPECT_FALSE(isEnabled(kSKServiceIDMail));
    EXPECT_EQ(bus.property(path, "MailDisabled"), "false"); // as it was
}

TEST_F(OnlineAccountDaemon, WhatAnotherProgramSwitchesIsWhatCounts) {
    OnlineAccountsBus bus;
    const std::string path = bus.addCloudAccount("bert", false);
    // At once, while the interface is still there: the daemon removes it a little later, and now and then it
    // is faster than the question.
    bool wasStillThere = false;
    for (int attempt = 0; attempt < 20 && !wasStillThere; ++attempt) {
        enable(kSKServiceIDContacts);
        bus.setProperty(path, "ContactsDisabled", true);
        EXPECT_FALSE(isEnabled(kSKServiceIDContacts));
        wasStillThere = bus.hasInterface(path, "Contacts");
    }
    EXPECT_TRUE(wasStillThere);
}

TEST_F(OnlineAccountDaemon, OfDuplicatesTheOneThatWasMadeFirstIsSwitched) {
    OnlineAccountsBus bus;
    Names paths;
    for (int i = 0; i < 11; ++i) { // "…_10" comes before "…_2" in the alphabet
        paths.push_back(bus.addCloudAccount("bert", false));
    }
    enable(kSKServiceIDContacts);
    EXPECT_EQ(bus.property(paths[0], "ContactsDisabled"), "false");
    for (std::size_t i = 1; i < paths.size(); ++i) {
        EXPECT_EQ(bus.property(paths[i], "ContactsDisabled"), "true") << paths[i];
    }
    bus.remove(paths[0]);
    bus.remove(paths[1]);
    EXPECT_FALSE(isEnabled(kSKServiceIDContacts));
    enable(kSKServiceIDContacts);
    EXPECT_EQ(bus.property(paths[2], "ContactsDisabled"), "false");
    EXPECT_EQ(bus.property(paths[10], "ContactsDisabled"), "true");
}

TEST_F(OnlineAccountDaemon, TwentySwitchesOfShortProcessesAllArrive) {
    OnlineAccountsBus bus;
    const std::string path = bus.addCloudAccount("bert", false);
    int right = 0;
    for (int i = 0; i < 20; ++i) {
        const bool isOn = i % 2 == 0;
        EXPECT_EQ(switchInAProcess(kSKServiceIDContacts, isOn ? "on" : "off"), 0);
        right += bus.property(path, "ContactsDisabled") == (isOn ? "false" : "true") ? 1 : 0;
        EXPECT_EQ(bus.hasInterface(path, "Contacts"), isOn);
        EXPECT_EQ(isEnabled(kSKServiceIDContacts), isOn);
    }
    EXPECT_EQ(right, 20);
    EXPECT_NE(storedAccounts().find("ContactsEnabled=false"), std::string::npos) << storedAccounts();
}

TEST_F(OnlineAccountDaemon, SwitchesFromSeveralThreadsAllArrive) {
    OnlineAccountsBus bus;
    const std::string cloud = bus.addCloudAccount("bert", false);
    const std::string mail = bus.addMailAccount("bert", "bert@mail.example", false);
    std::vector<std::thread> threads;
    for (const Switch& entry : kSwitches) {
        threads.emplace_back([this, service = std::string(entry.service)] {
            for (const bool isOn : {true, false, true}) {
                enable(service, isOn);
                EXPECT_EQ(isEnabled(service), isOn);
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    for (const auto& [service, property, interface] : kSwitches) {
        const std::string& path = service == std::string(kSKServiceIDMail) ? mail : cloud;
        EXPECT_EQ(bus.property(path, property), "false");
        EXPECT_TRUE(bus.hasInterface(path, interface)) << interface;
    }
}

TEST_F(OnlineAccountDaemon, SigningInMakesOneAccountWithThePasswordAndEverythingSwitchedOff) {
    backend.addUser("anna", "secret ä\"'\n");
    ASSERT_EQ(signIn("anna", "secret ä\"'\n"), kSKNotificationSignInCompleted);
    ASSERT_EQ(signIn("anna", "secret ä\"'\n"), kSKNotificationSignInCompleted);
    OnlineAccountsBus bus;
    ASSERT_EQ(bus.accounts().size(), 1U);
    const std::string path = bus.accounts()[0];
    EXPECT_EQ(bus.property(path, "ProviderType"), "'owncloud'");
    EXPECT_EQ(bus.property(path, "Identity"), "'anna'");
    EXPECT_EQ(bus.property(path, "PresentationIdentity"), "'anna@127.0.0.1'");
    for (const char* property : {"ContactsDisabled", "CalendarDisabled", "FilesDisabled"}) {
        EXPECT_EQ(bus.property(path, property), "true") << property;
    }
    EXPECT_EQ(bus.password(path), "secret ä\"'\n");
    EXPECT_NE(storedAccounts().find("Uri=http://127.0.0.1:9/\n"), std::string::npos) << storedAccounts();
    EXPECT_NE(storedAccounts().find("AcceptSslErrors=false\n"), std::string::npos) << storedAccounts();
    EXPECT_EQ(loggedIn(), "anna");
}

TEST_F(OnlineAccountDaemon, AWrongPasswordMakesNoAccount) {
    backend.addUser("anna", "secret");
    ASSERT_EQ(signIn("anna", "wrong"), kSKNotificationSignInFailed);
    EXPECT_EQ(OnlineAccountsBus().accounts(), Names{});
}

TEST_F(OnlineAccountDaemon, ManyAtOnceMakeOneAccount) {
    const desktop::NewOnlineAccount account{
        "owncloud", "anna", posix::SecretText("secret"), "http://127.0.0.1:9/", {}};
    std::vector<std::thread> threads;
    for (int i = 0; i < 8; ++i) {
        threads.emplace_back([&] { EXPECT_TRUE(backend.onlineAccounts()->makeOnce(account)); });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(OnlineAccountsBus().accounts().size(), 1U);
    EXPECT_TRUE(backend.onlineAccounts()->makeOnce(
        {"owncloud", "bert@example.org", posix::SecretText(""), "http://127.0.0.1:9/", {}}));
    OnlineAccountsBus bus;
    ASSERT_EQ(bus.accounts().size(), 2U);
    EXPECT_EQ(bus.property(bus.accounts()[1], "PresentationIdentity"), "'bert@example.org'");
}

TEST_F(OnlineAccountDaemon, WhatTheBusDoesNotTakeMakesNoAccountAndHarmsNobody) {
    for (const std::string& text : {std::string("an\xff"), std::string("an\0na", 5)}) {
        EXPECT_FALSE(backend.onlineAccounts()->makeOnce(
            {"owncloud", text, posix::SecretText("secret"), "http://127.0.0.1:9/", {}}));
        EXPECT_FALSE(backend.onlineAccounts()->makeOnce(
            {"owncloud", "anna", posix::SecretText(text), "http://127.0.0.1:9/", {}}));
    }
    EXPECT_FALSE(backend.onlineAccounts()->makeOnce(
        {"no_such_kind", "anna", posix::SecretText("secret"), "http://127.0.0.1:9/", {}}));
    EXPECT_EQ(OnlineAccountsBus().accounts(), Names{});
    ASSERT_TRUE(backend.onlineAccounts()->list());
}

TEST_F(OnlineAccountDaemon, WhoRemovesTheOnlineAccountIsLoggedOutUntilTheNextSignIn) {
    backend.addUser("anna", "secret");
    ASSERT_EQ(signIn("anna", "secret"), kSKNotificationSignInCompleted);
    OnlineAccountsBus bus;
    bus.remove(bus.accounts().at(0));
    EXPECT_EQ(loggedIn(), "nobody");
    ASSERT_EQ(signIn("anna", "secret"), kSKNotificationSignInCompleted);
    EXPECT_EQ(bus.accounts().size(), 1U);
    EXPECT_EQ(loggedIn(), "anna");
}

// What CI must have; elsewhere the tests that need it are skipped.
class Programs : public testing::Environment {
  public:
    void SetUp() override {
        const Names missing = DesktopSession::missingPrograms();
        if (!missing.empty() && ::geteuid() != 0) {
            GTEST_SKIP() << missing.front() << " is missing";
        }
    }
};
[[maybe_unused]] testing::Environment* const programs =
    testing::AddGlobalTestEnvironment(new Programs); // registers itself

} // namespace
} // namespace welcomer
