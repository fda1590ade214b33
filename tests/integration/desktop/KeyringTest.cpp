// The credential store of a desktop on a real gnome-keyring.

#include "tests/contract/CredentialStoreContract.h"
#include "tests/integration/desktop/KeyringFixture.h"
#include "tests/support/FindCredential.h"
#include "tests/support/KeyringSession.h"

#include <sys/wait.h>

namespace welcomer {

struct KeyringCredentials {
    TemporaryRoot root;
    KeyringSession session;
    UsersCredentials credentials{root};
    platform::CredentialStore& store = credentials.desktop.store();
    const std::string storeName = "Secret Service";

    KeyringCredentials() { session.startKeyring(); }
};

namespace contract {
INSTANTIATE_TYPED_TEST_SUITE_P(Keyring, CredentialStoreContract, KeyringCredentials);
}

TEST_F(KeyringTest, OtherProgramsFindTheItemByItsAttributesAndSeeItsLabel) {
    session.startKeyring();
    ASSERT_EQ(create("the secret"), 0);
    EXPECT_EQ(lookUpOutside(), "the secret");
    EXPECT_NE(outputOf({"secret-tool", "search", "service", "service"}).find("label = a label"),
              std::string::npos);
    EXPECT_EQ(readLocally(), platform::kCredentialItemNotFound);
}

TEST_F(KeyringTest, AnItemOfAnotherProgramIsFoundAndNotReplaced) {
    session.startKeyring();
    Daemon({"secret-tool", "store", "--label=theirs", "service", "service", "account", "account"},
           "their secret", "")
        .waitForLine("-"); // it has ended
    EXPECT_EQ(create("ours"), platform::kCredentialDuplicateItem);
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(data, "their secret");
}

TEST_F(KeyringTest, WithoutADefaultCollectionOneIsMade) {
    session.startEmptyKeyring();
    Daemon prompter = session.startPrompter("ok");
    EXPECT_EQ(create("the secret"), 0);
    EXPECT_EQ(lookUpOutside(), "the secret");
}

TEST_F(KeyringTest, WhoRefusesToHaveACollectionMadeIsHeeded) {
    session.startEmptyKeyring();
    Daemon prompter = session.startPrompter("refuse");
    EXPECT_EQ(create("the secret"), platform::kCredentialDismissed);
    EXPECT_EQ(readLocally(), platform::kCredentialItemNotFound);
}

TEST_F(KeyringTest, ALockedKeyringIsUnlockedByWhoAnswers) {
    session.startKeyring();
    ASSERT_EQ(create("the secret"), 0);
    session.lockKeyring();
    Daemon prompter = session.startPrompter("ok");
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(data, "the secret");
    EXPECT_EQ(credentials.desktop.store().deleteItem(*reference), 0);
    EXPECT_EQ(read(), platform::kCredentialItemNotFound);
}

TEST_F(KeyringTest, ALockedKeyringIsUnlockedToCreateAnItem) {
    session.startKeyring();
    session.lockKeyring();
    Daemon prompter = session.startPrompter("ok");
    EXPECT_EQ(create("the secret"), 0);
    EXPECT_EQ(read(), 0);
}

TEST_F(KeyringTest, ALockedItemIsNotCreatedAgain) {
    session.startKeyring();
    ASSERT_EQ(create("the secret"), 0);
    session.lockKeyring();
    EXPECT_EQ(create("another"), platform::kCredentialDuplicateItem);
}

TEST_F(KeyringTest, ALockedKeyringWithoutAPrompterIsLocked) {
    session.startKeyring();
    ASSERT_EQ(create("the secret"), 0);
    session.lockKeyring();
    EXPECT_EQ(read(), platform::kCredentialLocked);
    EXPECT_EQ(data, "untouched");
}

TEST_F(KeyringTest, AUserWhoRefusesToUnlockHasDismissedIt) {
    session.startKeyring();
    ASSERT_EQ(create("the secret"), 0);
    session.lockKeyring();
    Daemon prompter = session.startPrompter("refuse");
    EXPECT_EQ(read(), platform::kCredentialDismissed);
    EXPECT_EQ(data, "untouched");
}

TEST_F(KeyringTest, APromptThatNobodyAnswersIsGivenUp) {
    session.startKeyring();
    ASSERT_EQ(create("the secret"), 0);
    session.lockKeyring();
    Daemon prompter = session.startPrompter("silent");
    UsersCredentials store = impatient();
    EXPECT_EQ(findCredential(store.desktop.store(), &data, &reference),
              platform::kCredentialPromptUnanswered);
    EXPECT_TRUE(prompter.waitForLine("BeginPrompting"));
    EXPECT_EQ(data, "untouched");
    EXPECT_EQ(reference, nullptr);
}

TEST_F(KeyringTest, APromptThatIsGivenUpLeavesTheKeyringRunning) {
    session.startKeyring();
    Daemon({"secret-tool", "store", "--label=theirs", "service", "service", "account", "account"},
           "their secret", "")
        .waitForLine("-"); // it has ended
    session.lockKeyring();
    const std::string owner = session.keyringOwner();
    ASSERT_NE(owner, "");
    {
        Daemon prompter = session.startPrompter("silent");
        const pid_t reader = ::fork();
        if (reader == 0) {
            // Nothing of GLib has been used in this process so far.
            UsersCredentials own = impatient();
            ::_exit(findCredential(own.desktop.store(), &data, nullptr));
        }
        int status = -1;
        ASSERT_EQ(::waitpid(reader, &status, 0), reader);
        ASSERT_TRUE(WIFEXITED(status));
        EXPECT_EQ(WEXITSTATUS(status), platform::kCredentialPromptUnanswered);
    }
    Daemon prompter = session.startPrompter("ok");
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(data, "their secret");
    EXPECT_EQ(session.keyringOwner(), owner);
}

TEST(CredentialModuleTest, APromptIsGivenUpAfterTwoMinutes) {
    EXPECT_EQ(desktop::CredentialModule::Arguments().promptPatience, 2min);
}

TEST(CredentialModuleTest, AQuestionIsOverAfterTenSeconds) {
    EXPECT_EQ(desktop::CredentialModule::Arguments().questionLimit, 10s);
}

TEST_F(KeyringTest, AKeyringThatHangsIsATimeOutAndTheLocalStoreDoesNotTakeOver) {
    session.startKeyring();
    ASSERT_EQ(create("the secret"), 0);
    session.holdKeyring(true);
    // Its prompts would wait for two minutes.
    UsersCredentials hasty(root, 120s, 300ms);
    platform::CredentialStore& store = hasty.desktop.store();
    EXPECT_EQ(findCredential(store, &data, &reference), platform::kCredentialFindTimedOut);
    EXPECT_EQ(data, "untouched");
    EXPECT_EQ(reference, nullptr);
    EXPECT_EQ(store.createItem(kItem, "another"), platform::kCredentialCreateTimedOut);
    EXPECT_EQ(readLocally(), platform::kCredentialItemNotFound);
    session.holdKeyring(false);
}

TEST_F(KeyringTest, AKeyringThatHangsLeavesAnItemThatWasFoundAsItIs) {
    session.startKeyring();
    UsersCredentials hasty(root, 120s, 3s);
    platform::CredentialStore& store = hasty.desktop.store();
    ASSERT_EQ(store.createItem(kItem, "the secret"), 0);
    ASSERT_EQ(findCredential(store, &data, &reference), 0);
    session.holdKeyring(true);
    platform::CredentialItem item{"untouched", "", "", {}};
    EXPECT_EQ(findCredential(store, nullptr, nullptr, &item), platform::kCredentialFindTimedOut);
    EXPECT_EQ(item.service, "untouched");
    EXPECT_EQ(store.deleteItem(*reference), platform::kCredentialDeleteTimedOut);
    session.holdKeyring(false);
    EXPECT_EQ(lookUpOutside(), "the secret");
}

TEST_F(KeyringTest, ABusThatHangsIsATimeOut) {
    session.startKeyring();
    session.holdBus(true);
    const pid_t reader = ::fork();
    if (reader == 0) {
        // Nothing of GLib has been used in this process so far.
        UsersCredentials own(root, 120s, 300ms);
        ::_exit(findCredential(own.desktop.store(), &data, nullptr));
    }
    int status = -1;
    EXPECT_EQ(::waitpid(reader, &status, 0), reader);
    session.holdBus(false);
    ASSERT_TRUE(WIFEXITED(status));
    EXPECT_EQ(WEXITSTATUS(status), platform::kCredentialFindTimedOut);
}

// The prompt's own time is not counted.
TEST_F(KeyringTest, APersonMayTakeLongerThanAQuestion) {
    session.startKeyring();
    ASSERT_EQ(create("the secret"), 0);
    session.lockKeyring();
    Daemon prompter = session.startPrompter("silent");
    UsersCredentials store(root, 5s, 2s);
    EXPECT_EQ(findCredential(store.desktop.store(), &data, &reference),
              platform::kCredentialPromptUnanswered);
}

TEST_F(KeyringTest, ShowingTheReplayItemSaysThatTheKeyringDoesNotEnforceItsAccess) {
    session.startKeyring();
    platform::CredentialItem item{"Welcomer Nimbus Replay Data", "Welcomer", "a user",
                                  platform::CredentialAccess{"an access", {{"/a/program"}}}};
    ASSERT_EQ(credentials.desktop.store().createItem(item, "{ a = 1; }"), 0);
    EXPECT_EQ(outputOf({WELCOMER_TOOL, "replay", "show"}),
              "Account:   a user\n"
              "Stored in: Secret Service\n"
              "Access:    an access\n"
              "Trusted:   /a/program\n"
              "           (kept with the item, but the Secret Service does not enforce it)\n"
              "Readers:   every program of the session, while the keyring is unlocked\n"
              "Replay object:\n"
              "  a: 1");
    EXPECT_EQ(outputOf({WELCOMER_TOOL, "--json", "replay", "show"}),
              "{\n  \"account\": \"a user\",\n  \"replay\": {\n    \"a\": \"1\"\n  }\n}");
}

TEST_F(KeyringTest, WhatTheLocalStoreHoldsIsFoundThoughTheKeyringIsLocked) {
    ASSERT_EQ(credentials.local.createItem(kItem, "local secret"), 0);
    session.startKeyring();
    session.lockKeyring();
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(data, "local secret");
}

TEST_F(KeyringTest, ASecretOf48MiBIsTheLargest) {
    session.startKeyring();
    std::string large(desktop::kLargestSecret + 1, 'x');
    EXPECT_EQ(create(large), platform::kCredentialTooLarge);
    EXPECT_EQ(read(), platform::kCredentialItemNotFound);
    large.pop_back();
    EXPECT_EQ(create(large), 0);
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(data.size(), large.size());
    EXPECT_TRUE(data == large);
}

TEST_F(KeyringTest, WithoutAServiceTheLocalStoreServesAlone) {
    // Nothing can be activated on this bus.
    ::unsetenv("DBUS_SESSION_BUS_ADDRESS");
    const TemporaryRoot folder;
    folder.addFile("/bus.conf",
                   "<busconfig><type>session</type><listen>unix:dir=" + folder.path() +
                       "</listen><policy context='default'><allow send_destination='*' eavesdrop='true'/>"
                       "<allow eavesdrop='true'/><allow own='*'/></policy></busconfig>");
    Daemon bus({"dbus-daemon", "--config-file=" + folder.locate("/bus.conf"), "--nofork", "--print-address"},
               "", "unix:");
    ::setenv("DBUS_SESSION_BUS_ADDRESS", ("unix:" + bus.answer()).c_str(), 1);

    EXPECT_EQ(create("the secret"), 0);
    EXPECT_EQ(readLocally(), 0);
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(credentials.desktop.store().deleteItem(*reference), 0);
    EXPECT_EQ(credentials.desktop.report().backend, "local file");
    EXPECT_EQ(credentials.desktop.report().reason, "no credential service runs or can be started");
}

TEST_F(KeyringTest, WithoutABusTheLocalStoreServesAloneAndNothingIsLoaded) {
    ::unsetenv("DBUS_SESSION_BUS_ADDRESS");
    EXPECT_EQ(create("the secret"), 0);
    EXPECT_EQ(readLocally(), 0);
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(credentials.desktop.report().reason, "there is no session bus");
    EXPECT_EQ(outputOf({"grep", "-c", "libsecret", "/proc/" + std::to_string(::getpid()) + "/maps"}), "0");
}

TEST_F(KeyringTest, AnAddressWhereNoBusAnswersIsNoBus) {
    ::setenv("DBUS_SESSION_BUS_ADDRESS", "unix:path=/nonexistent/bus", 1);
    EXPECT_EQ(create("the secret"), 0);
    EXPECT_EQ(readLocally(), 0);
    const platform::BackendReport report = credentials.desktop.report();
    EXPECT_EQ(report.backend, "local file");
    EXPECT_EQ(report.reason, "the session bus is dead, so that the keyring cannot be asked");
}

TEST_F(KeyringTest, WithAKeyringsFileNoBusLeavesOpenWhatTheKeyringHolds) {
    root.addFile("/home/user/.local/share/keyrings/login.keyring", "a keyring");
    ::unsetenv("DBUS_SESSION_BUS_ADDRESS");
    EXPECT_EQ(read(), platform::kCredentialNoBus);
    EXPECT_EQ(create("the secret"), platform::kCredentialNoBus);
    ::setenv("DBUS_SESSION_BUS_ADDRESS", "unix:path=/nonexistent/bus", 1);
    EXPECT_EQ(read(), platform::kCredentialBusDied);
    EXPECT_EQ(create("the secret"), platform::kCredentialBusDied);
    EXPECT_EQ(readLocally(), platform::kCredentialItemNotFound);
}

TEST_F(KeyringTest, TheReportSaysWhetherTheKeyringIsUnlocked) {
    session.startKeyring();
    EXPECT_EQ(credentials.desktop.report(), (platform::BackendReport{"CredentialStore", "Secret Service",
                                                                     "the default keyring is unlocked", ""}));
    session.lockKeyring();
    EXPECT_EQ(credentials.desktop.report().reason, "the default keyring is locked");
    EXPECT_NE(credentials.desktop.report().advice, "");
}

TEST_F(KeyringTest, TheReportSaysThatThereIsNoDefaultKeyring) {
    session.startEmptyKeyring();
    EXPECT_EQ(credentials.desktop.report().reason, "the service runs; there is no default keyring yet");
}

} // namespace welcomer
