// The account service where the daemon ends, waits, begins late or is not there.

#include "tests/integration/accounts/OnTheDaemon.h"
#include "tests/integration/accounts/OnlineAccountSession.h"
#include "tests/integration/accounts/OnlineAccountsBus.h"

#include <stdexcept>
#include <string>

namespace welcomer {
namespace {

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
    ASSERT_TRUE(backend.onlineAccounts()->makeOnce({"owncloud",
                                                    "bert",
                                                    posix::SecretText("secret"),
                                                    "http://127.0.0.1:9/",
                                                    {true, false, true, false}}));
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

} // namespace
} // namespace welcomer
