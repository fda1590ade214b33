// The account service and the real daemon.

#include "tests/contract/TimeBackends.h"
#include "tests/integration/accounts/OnlineAccountSession.h"
#include "tests/integration/accounts/OnlineAccountsBus.h"

#include <gtest/gtest.h>

#include <fstream>
#include <iterator>
#include <memory>
#include <spawn.h>
#include <stdexcept>
#include <string>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace welcomer {
namespace {

using namespace platform;
using contract::LocalTime;
using Names = std::vector<std::string>;

// Bert is nobody's user: his account has all services.
template <class Session>
class OnTheDaemon : public testing::Test {
  protected:
    std::shared_ptr<CloudAccount> bert() { return backend.service.accountForID("bert", true); }
    void enable(const std::string& identifier, bool isOn = true) {
        bert()->serviceForID(identifier)->enableSilently(isOn);
    }
    bool isEnabled(const std::string& identifier) {
        return backend.service.isServiceEnabled(bert().get(), identifier);
    }
    std::string loggedIn() {
        const auto account = backend.service.loggedInAccount();
        return account ? account->accountID() : "nobody";
    }

    // The end of a sign-in.
    std::string signIn(const std::string& name, const std::string& password) {
        std::string ending;
        std::vector<std::unique_ptr<NotificationObservation>> observations;
        for (const char* end : {kSKNotificationSignInCompleted, kSKNotificationSignInFailed}) {
            observations.push_back(backend.center.addObserver(
                end, [&](const Notification& notification) { ending = notification.name; }));
        }
        backend.service.finishSignIn(name, password, {});
        while (ending.empty()) {
            backend.time.runLoops.current()->run(contract::tooLong);
        }
        return ending;
    }

    // A process of its own that switches a service and ends at once.
    //  result  its exit status
    int switchInAProcess(const std::string& identifier, const std::string& state) {
        std::vector<std::string> words = {WELCOMER_SWITCH_SERVICE, backend.embedded.root.path(), "bert",
                                          identifier, state};
        std::vector<char*> arguments;
        for (std::string& word : words) {
            arguments.push_back(word.data());
        }
        arguments.push_back(nullptr);
        pid_t process = 0;
        if (::posix_spawn(&process, arguments[0], nullptr, nullptr, arguments.data(), environ) != 0) {
            return -1;
        }
        int status = 0;
        ::waitpid(process, &status, 0);
        return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    }

    std::string storedAccounts() {
        std::ifstream file(backend.session.home() + "/.config/goa-1.0/accounts.conf");
        return {std::istreambuf_iterator<char>(file), {}};
    }

    OnlineAccountsOf<Session, LocalTime> backend;
};

struct Switch {
    const char* service;
    const char* property;
    const char* interface;
};
constexpr Switch kSwitches[] = {{kSKServiceIDContacts, "ContactsDisabled", "Contacts"},
                                {kSKServiceIDCalendars, "CalendarDisabled", "Calendar"},
                                {kSKServiceMobileDocuments, "FilesDisabled", "Files"},
                                {kSKServiceIDMail, "MailDisabled", "Mail"}};

using OnlineAccountDaemon = OnTheDaemon<RunningOnlineAccounts>;

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
    const desktop::NewOnlineAccount account{"owncloud", "anna", "secret", "http://127.0.0.1:9/", {}};
    std::vector<std::thread> threads;
    for (int i = 0; i < 8; ++i) {
        threads.emplace_back([&] { EXPECT_TRUE(backend.onlineAccounts()->makeOnce(account)); });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(OnlineAccountsBus().accounts().size(), 1U);
    EXPECT_TRUE(
        backend.onlineAccounts()->makeOnce({"owncloud", "bert@example.org", "", "http://127.0.0.1:9/", {}}));
    OnlineAccountsBus bus;
    ASSERT_EQ(bus.accounts().size(), 2U);
    EXPECT_EQ(bus.property(bus.accounts()[1], "PresentationIdentity"), "'bert@example.org'");
}

TEST_F(OnlineAccountDaemon, WhatTheBusDoesNotTakeMakesNoAccountAndHarmsNobody) {
    for (const std::string& text : {std::string("an\xff"), std::string("an\0na", 5)}) {
        EXPECT_FALSE(
            backend.onlineAccounts()->makeOnce({"owncloud", text, "secret", "http://127.0.0.1:9/", {}}));
        EXPECT_FALSE(
            backend.onlineAccounts()->makeOnce({"owncloud", "anna", text, "http://127.0.0.1:9/", {}}));
    }
    EXPECT_FALSE(
        backend.onlineAccounts()->makeOnce({"no_such_kind", "anna", "secret", "http://127.0.0.1:9/", {}}));
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

TEST_F(OnlineAccountDaemon, ADaemonThatDiesLeavesTheAccountFileToServe) {
    backend.addUser("anna", "secret");
    ASSERT_EQ(signIn("anna", "secret"), kSKNotificationSignInCompleted);
    OnlineAccountsBus().addCloudAccount("bert", false);
    enable(kSKServiceIDContacts);
    backend.session.killOnlineAccounts();
    EXPECT_TRUE(isEnabled(kSKServiceIDContacts));
    enable(kSKServiceIDCalendars);
    EXPECT_TRUE(isEnabled(kSKServiceIDCalendars));
    enable(kSKServiceIDContacts, false);
    EXPECT_FALSE(isEnabled(kSKServiceIDContacts));
    EXPECT_EQ(loggedIn(), "anna");
    EXPECT_EQ(signIn("anna", "secret"), kSKNotificationSignInCompleted);
    EXPECT_FALSE(backend.onlineAccounts()->list());

    backend.session.startOnlineAccounts();
    EXPECT_EQ(OnlineAccountsBus().accounts().size(), 2U);
    EXPECT_TRUE(isEnabled(kSKServiceIDContacts)); // the switch again
    EXPECT_EQ(loggedIn(), "anna");
}

TEST_F(OnlineAccountDaemon, TheBusMayDieAndComeBack) {
    OnlineAccountsBus().addCloudAccount("bert", false);
    enable(kSKServiceIDContacts);
    EXPECT_TRUE(isEnabled(kSKServiceIDContacts));
    backend.session.killBus();
    for (int i = 0; i < 3; ++i) {
        enable(kSKServiceIDCalendars);
        EXPECT_TRUE(isEnabled(kSKServiceIDCalendars));
        enable(kSKServiceIDCalendars, false);
        EXPECT_FALSE(isEnabled(kSKServiceIDCalendars));
    }
    EXPECT_FALSE(backend.onlineAccounts()->list());
    backend.session.killOnlineAccounts();
    backend.session.startBus();
    backend.session.startOnlineAccounts();
    EXPECT_TRUE(backend.onlineAccounts()->list());
    enable(kSKServiceIDContacts, false);
    OnlineAccountsBus bus;
    EXPECT_EQ(bus.property(bus.accounts().at(0), "ContactsDisabled"), "true");
}

TEST_F(OnlineAccountDaemon, ADaemonThatKeepsAQuestionWaitingIsNotAskedAgain) {
    OnlineAccountsBus().addCloudAccount("bert", true);
    EXPECT_TRUE(isEnabled(kSKServiceIDContacts));
    backend.session.freezeOnlineAccounts();
    EXPECT_FALSE(isEnabled(kSKServiceIDContacts)); // the account file
    backend.session.thawOnlineAccounts();
    EXPECT_FALSE(backend.onlineAccounts()->list());
    EXPECT_TRUE(OnlineAccountsBus().accounts().size() == 1);
}

TEST_F(OnlineAccountDaemon, TheModuleSaysThatItServes) {
    BackendReport report;
    EXPECT_TRUE(backend.module.describe(report));
    EXPECT_EQ(report.backend, "GNOME Online Accounts");
    EXPECT_NE(report.reason.find("with 0 accounts"), std::string::npos) << report.reason;
    OnlineAccountsBus().addCloudAccount("bert", true);
    EXPECT_TRUE(backend.module.describe(report));
    EXPECT_NE(report.reason.find("with 1 account;"), std::string::npos) << report.reason;
}

TEST_F(OnlineAccountDaemon, ASwitchThatHasNoEffectIsWaitedForOnlyOnce) {
    OnlineAccountsBus bus;
    const std::string path = bus.addCloudAccount("bert", true);
    bus.setProperty(path, "MailDisabled", true); // which the provider does not know
    EXPECT_FALSE(isEnabled(kSKServiceIDMail));
    const auto account = backend.onlineAccounts()->list().value().at(0);
    EXPECT_FALSE(backend.onlineAccounts()->setFeature(account, desktop::OnlineFeature::Mail, true));
    enable(kSKServiceIDMail);
    EXPECT_TRUE(isEnabled(kSKServiceIDMail));
    EXPECT_FALSE(bus.hasInterface(path, "Mail"));
}

TEST_F(OnlineAccountDaemon, AnAccountBeginsWithWhatItIsToldTo) {
    ASSERT_TRUE(backend.onlineAccounts()->makeOnce(
        {"owncloud", "bert", "secret", "http://127.0.0.1:9/", {true, false, true, false}}));
    EXPECT_TRUE(isEnabled(kSKServiceIDContacts));
    EXPECT_FALSE(isEnabled(kSKServiceIDCalendars));
    EXPECT_TRUE(isEnabled(kSKServiceMobileDocuments));
}

// No keyring takes the password.
struct WithoutKeyring : OnlineAccountSession {
    WithoutKeyring() {
        session.startBus();
        session.startOnlineAccounts();
    }
};
using OnlineAccountWithoutKeyring = OnTheDaemon<WithoutKeyring>;

TEST_F(OnlineAccountWithoutKeyring, SigningInMakesAnAccountWhosePasswordTheUserGivesAgain) {
    backend.addUser("anna", "secret");
    EXPECT_EQ(signIn("anna", "secret"), kSKNotificationSignInCompleted);
    EXPECT_EQ(loggedIn(), "anna");
    OnlineAccountsBus bus;
    ASSERT_EQ(bus.accounts().size(), 1U);
    EXPECT_THROW(bus.password(bus.accounts()[0]), std::runtime_error);
    const auto anna = backend.service.loggedInAccount();
    anna->serviceForID(kSKServiceIDContacts)->enableSilently(true);
    EXPECT_TRUE(bus.hasInterface(bus.accounts()[0], "Contacts"));
}

struct StartedByTheBus : OnlineAccountSession {
    StartedByTheBus() {
        session.letBusStartOnlineAccounts();
        session.startBus();
        session.startKeyring();
    }
};
using OnlineAccountStartedByTheBus = OnTheDaemon<StartedByTheBus>;

TEST_F(OnlineAccountStartedByTheBus, TheFirstQuestionFindsWhatIsThere) {
    backend.addUser("anna", "secret");
    EXPECT_EQ(signIn("anna", "secret"), kSKNotificationSignInCompleted);
    EXPECT_EQ(loggedIn(), "anna");
    EXPECT_EQ(OnlineAccountsBus().accounts().size(), 1U);
}

struct NoDaemon : OnlineAccountSession {
    NoDaemon() { session.startBus(); }
};
using OnlineAccountNoDaemon = OnTheDaemon<NoDaemon>;

TEST_F(OnlineAccountNoDaemon, TheModuleSaysThatItDoesNotServe) {
    BackendReport report;
    EXPECT_FALSE(backend.module.describe(report));
    EXPECT_NE(report.reason.find("no daemon"), std::string::npos) << report.reason;
    EXPECT_FALSE(report.advice.empty());
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
