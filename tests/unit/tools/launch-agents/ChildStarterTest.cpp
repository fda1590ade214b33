#include "tools/launch-agents/ChildStarter.h"

#include "tests/contract/TemporaryRoot.h"

#include <cerrno>
#include <csignal>
#include <gtest/gtest.h>
#include <sys/wait.h>

namespace welcomer::launch {
namespace {

class ChildStarterTest : public testing::Test {
  protected:
    // What a script leaves in the file "out", once it has ended; this process has no other children.
    std::string outputOf(const std::string& script, const std::vector<std::string>& arguments = {}) {
        LaunchAgent agent{"one", "/bin/sh", {"sh", "-c", script, "script"}, true};
        agent.arguments.insert(agent.arguments.end(), arguments.begin(), arguments.end());
        EXPECT_TRUE(_starter.start(agent));
        int status = -1;
        _child = ::wait(&status);
        EXPECT_EQ(status, 0);
        return _root.content("/out").value_or("(nothing)");
    }

    TemporaryRoot _root;
    ChildStarter _starter{_root.path()};
    pid_t _child = 0;
};

TEST_F(ChildStarterTest, StartsTheProgramInTheHomeFolderWithItsArguments) {
    EXPECT_EQ(outputOf("printf '%s|' \"$@\" > out", {"a b", "", "$HOME", "%h"}), "a b||$HOME|%h|");
}

TEST_F(ChildStarterTest, TheAgentLeadsASessionOfItsOwn) {
    const std::string session = outputOf("cut -d' ' -f6 /proc/$$/stat > out");
    EXPECT_EQ(session, std::to_string(_child) + "\n");
}

TEST_F(ChildStarterTest, TheAgentsStandardStreamsLeadNowhere) {
    EXPECT_EQ(
        outputOf("found=$(for n in 0 1 2; do readlink /proc/$$/fd/$n; done); printf '%s' \"$found\" > out"),
        "/dev/null\n/dev/null\n/dev/null");
}

TEST_F(ChildStarterTest, TheAgentInheritsNoSignalSettings) {
    sigset_t blocked;
    ::sigemptyset(&blocked);
    ::sigaddset(&blocked, SIGTERM);
    ASSERT_EQ(::sigprocmask(SIG_BLOCK, &blocked, nullptr), 0);
    ASSERT_NE(::signal(SIGHUP, SIG_IGN), SIG_ERR);
    // The first 28 signals: of the others the C library has two to itself.
    EXPECT_EQ(outputOf("grep -E 'SigBlk|SigIgn' /proc/self/status | cut -f2 | cut -c10- > out"),
              "0000000\n0000000\n");
}

TEST_F(ChildStarterTest, AProgramThatIsMissingIsAFailure) {
    const platform::Outcome outcome = _starter.start({"one", "/missing/program", {"program"}, true});
    EXPECT_FALSE(outcome);
    EXPECT_EQ(outcome.error, (platform::Error{ENOENT, "No such file or directory"}));
    EXPECT_EQ(::wait(nullptr), -1);
}

} // namespace
} // namespace welcomer::launch
