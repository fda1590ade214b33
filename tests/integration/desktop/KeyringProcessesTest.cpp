// The credential store when the keyring or the bus ends, and beside other processes.

#include "tests/integration/desktop/KeyringFixture.h"
#include "tests/support/FindCredential.h"
#include "tests/support/KeyringSession.h"

#include <sys/wait.h>

namespace welcomer {

// How a keyring daemon ends before it is started again.
class RestartedKeyring : public KeyringTest, public testing::WithParamInterface<void (KeyringSession::*)()> {
  protected:
    void restart() {
        (session.*GetParam())();
        session.startKeyring();
    }
};
INSTANTIATE_TEST_SUITE_P(Ends, RestartedKeyring,
                         testing::Values(&KeyringSession::stopKeyring, &KeyringSession::killKeyring),
                         [](const auto& end) { return end.index == 0 ? "Stopped" : "Killed"; });

TEST_P(RestartedKeyring, ANewProcessFindsTheItem) {
    session.startKeyring();
    const pid_t writer = ::fork();
    if (writer == 0) {
        // Nothing of GLib has been used in this process so far.
        UsersCredentials own(root);
        ::_exit(own.desktop.store().createItem(kItem, "the secret").status);
    }
    int status = -1;
    ASSERT_EQ(::waitpid(writer, &status, 0), writer);
    ASSERT_EQ(status, 0);
    ASSERT_EQ(lookUpOutside(), "the secret");

    restart();
    EXPECT_EQ(lookUpOutside(), "the secret");
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(data, "the secret");
}

TEST_P(RestartedKeyring, TheStoreThatKnewTheOldOneFindsReadsAndDeletesTheItem) {
    session.startKeyring();
    ASSERT_EQ(create("the secret"), 0);
    for (int restarts = 0; restarts < 2; ++restarts) {
        ASSERT_EQ(read(), 0);
        restart();
        ASSERT_EQ(lookUpOutside(), "the secret");
        data.clear();
        EXPECT_EQ(read(), 0);
        EXPECT_EQ(data, "the secret");
    }
    // A reference from before the restart, too.
    restart();
    platform::CredentialItem item;
    EXPECT_EQ(findCredential(credentials.desktop.store(), nullptr, nullptr, &item), 0);
    EXPECT_EQ(item.label, "a label");
    EXPECT_EQ(credentials.desktop.store().deleteItem(*reference), 0);
    EXPECT_EQ(lookUpOutside(), "");
    EXPECT_EQ(create("another secret"), 0);
    EXPECT_EQ(lookUpOutside(), "another secret");
}

TEST_F(KeyringTest, TheProcessOutlivesTheBusAndSaysThatItIsDead) {
    session.startKeyring();
    ASSERT_EQ(create("the secret"), 0);
    ASSERT_EQ(read(), 0);
    session.killBus();

    EXPECT_NE(findCredential(credentials.desktop.store(), nullptr, nullptr), 0);
    EXPECT_NE(credentials.desktop.store().deleteItem(*reference), 0);
    EXPECT_EQ(read(), platform::kCredentialBusDied);
    EXPECT_EQ(create("the second secret"), platform::kCredentialBusDied);
    EXPECT_EQ(readLocally(), platform::kCredentialItemNotFound);
}

TEST_F(KeyringTest, OfTwoProcessesThatCreateAtOnceOneSucceeds) {
    session.startKeyring();
    for (int trial = 0; trial < 5; ++trial) {
        std::vector<pid_t> writers;
        for (const char* secret : {"one", "other"}) {
            const pid_t writer = ::fork();
            if (writer == 0) {
                // Nothing of GLib has been used in this process so far.
                UsersCredentials own(root);
                ::_exit(own.desktop.store().createItem(kItem, secret).status);
            }
            writers.push_back(writer);
        }
        int sum = 0;
        for (const pid_t writer : writers) {
            int status = 0;
            ::waitpid(writer, &status, 0);
            ASSERT_TRUE(WIFEXITED(status));
            sum += WEXITSTATUS(status);
        }
        EXPECT_EQ(sum, platform::kCredentialSuccess + platform::kCredentialDuplicateItem);
        const std::string found = outputOf({"secret-tool", "search", "--all", "service", "service"});
        EXPECT_NE(found.find("label = "), std::string::npos);
        EXPECT_EQ(found.find("label = "), found.rfind("label = "));
        outputOf({"secret-tool", "clear", "service", "service"});
    }
}

} // namespace welcomer
