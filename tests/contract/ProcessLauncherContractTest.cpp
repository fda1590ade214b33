// What every process launcher must do.

#include "backends/local/LocalProcessLauncher.h"
#include "platform/Error.h"
#include "tests/fakes/FakeProcessLauncher.h"

#include <gtest/gtest.h>

#include <chrono>
#include <csignal>
#include <string>
#include <type_traits>
#include <unistd.h>
#include <vector>

namespace welcomer::contract {
namespace {

const std::string kShell = "/bin/sh";

struct Local {
    local::LocalProcessLauncher launcher;
};

// Its shell knows "exit N" alone.
struct Fake {
    Fake() {
        launcher.programs[kShell] = [](const std::vector<std::string>& arguments) {
            return std::stoi(arguments.at(1).substr(5));
        };
    }
    fakes::CallRecorder recorder;
    fakes::FakeProcessLauncher launcher{recorder};
};

struct BackendNames {
    template <typename Backend>
    static std::string GetName(int) {
        return std::is_same_v<Backend, Local> ? "Local" : "Fake";
    }
};

template <typename Backend>
class ProcessLauncherContract : public testing::Test {
  protected:
    Backend backend;
};

using Backends = testing::Types<Local, Fake>;
TYPED_TEST_SUITE(ProcessLauncherContract, Backends, BackendNames);

TYPED_TEST(ProcessLauncherContract, GivesTheExitStatus) {
    for (const int status : {0, 1, 127, 255}) {
        EXPECT_EQ(this->backend.launcher.launchAndWait(kShell, {"-c", "exit " + std::to_string(status)}),
                  status);
    }
}

TYPED_TEST(ProcessLauncherContract, AMissingProgramRaisesWithItsPathInTheText) {
    try {
        this->backend.launcher.launchAndWait("/nowhere/program", {"-9", "name"});
        FAIL() << "nothing was raised";
    } catch (const platform::Exception& exception) {
        EXPECT_NE(std::string(exception.what()).find("/nowhere/program"), std::string::npos)
            << exception.what();
        EXPECT_NE(std::string(exception.what()).find("No such file or directory"), std::string::npos)
            << exception.what();
    }
}

class LocalProcessLauncherTest : public testing::Test {
  protected:
    // Runs a shell script.
    int run(const std::string& script, std::vector<std::string> arguments = {}) {
        arguments.insert(arguments.begin(), {"-c", script, "script"});
        return launcher.launchAndWait(kShell, arguments);
    }

    local::LocalProcessLauncher launcher;
};

TEST_F(LocalProcessLauncherTest, ArgumentsArePassedOnAsTheyStand) {
    EXPECT_EQ(run("test $# = 4 && test \"$1\" = 'a  b' && test \"$2\" = '' && test \"$3\" = '$HOME' && "
                  "test \"$4\" = '*'",
                  {"a  b", "", "$HOME", "*"}),
              0);
}

TEST_F(LocalProcessLauncherTest, AProgramThatASignalEndsGivesTheSignalAbove128) {
    EXPECT_EQ(run("kill -9 $$"), 128 + SIGKILL);
}

TEST_F(LocalProcessLauncherTest, AFolderOrAFileThatIsNoProgramRaises) {
    EXPECT_THROW(launcher.launchAndWait("/tmp", {}), platform::Exception);
    EXPECT_THROW(launcher.launchAndWait("/etc/passwd", {}), platform::Exception);
    EXPECT_THROW(launcher.launchAndWait("", {}), platform::Exception);
}

TEST_F(LocalProcessLauncherTest, TheProgramStartsWithNoSignalBlockedOrIgnored) {
    sigset_t signals;
    sigfillset(&signals);
    sigset_t before;
    ASSERT_EQ(sigprocmask(SIG_BLOCK, &signals, &before), 0);
    const auto pipeBefore = std::signal(SIGPIPE, SIG_IGN);
    // The C library keeps two signals beyond the first 31 for itself.
    const int status = launcher.launchAndWait(
        "/bin/grep",
        {"-qzE", "SigBlk:\\s0000000000000000\\sSigIgn:\\s[0-9a-f]{8}[08]0000000", "/proc/self/status"});
    std::signal(SIGPIPE, pipeBefore);
    sigprocmask(SIG_SETMASK, &before, nullptr);
    EXPECT_EQ(status, 0);
}

TEST_F(LocalProcessLauncherTest, TheProgramHasNothingToReadAndWhatItSaysIsDropped) {
    EXPECT_EQ(run("for i in 0 1 2; do test \"$(readlink /proc/$$/fd/$i)\" = /dev/null || exit 1; done; "
                  "echo said; echo said >&2; ! read line"),
              0);
}

TEST_F(LocalProcessLauncherTest, ItWaitsForTheEnd) {
    const auto now = [] {
        return std::chrono::steady_clock::now();
    };
    const auto before = now();
    EXPECT_EQ(run("sleep 0.1"), 0);
    EXPECT_GE(now() - before, std::chrono::milliseconds(100));
}

TEST_F(LocalProcessLauncherTest, AProgramThatCannotBeWaitedForRaises) {
    const auto before = std::signal(SIGCHLD, SIG_IGN); // its end is then nobody's to know
    EXPECT_THROW(run("exit 0"), platform::Exception);
    std::signal(SIGCHLD, before);
}

TEST_F(LocalProcessLauncherTest, TheRealKillallFindsNoSuchProcess) {
    // Of a process that has ended killall knows 15 characters of the name, and those must be nobody's.
    EXPECT_EQ(launcher.launchAndWait("/usr/bin/killall", {"-9", "com.corvid.nobody-runs-this"}), 1);
}

} // namespace
} // namespace welcomer::contract
