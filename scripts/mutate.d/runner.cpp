// Takes the place of GoogleTest's main in the programs that scripts/mutate links.
//
// usage: PROGRAM MUTANT TEST...
//
// Runs the test cases one after the other with a mutant switched on, each in a process of its own, until one
// fails, and says what became of the mutant. Without tests it is an ordinary test program, and so where a
// death test starts it.

#include <algorithm>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <gtest/gtest.h>
#include <string_view>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

int wl_mutant = 0;

namespace {

constexpr rlim_t kProcessorSeconds = 3; // a whole test case takes less than one
constexpr unsigned kSeconds = 60;       // for one that waits for what never comes

void limit(int resource, rlim_t value) {
    const rlimit both{value, value};
    ::setrlimit(resource, &both);
}

[[noreturn]] void runTest(const char* name) {
    ::setpgid(0, 0);
    limit(RLIMIT_CORE, 0);
    limit(RLIMIT_CPU, kProcessorSeconds);
    limit(RLIMIT_AS, rlim_t{4} << 30);
    ::alarm(kSeconds);
    if (!std::freopen("/dev/null", "w", stdout) || !std::freopen("/dev/null", "w", stderr)) {
        std::abort();
    }
    GTEST_FLAG_SET(filter, name);
    std::exit(RUN_ALL_TESTS());
}

} // namespace

int main(int argc, char** argv) {
    const bool isDeathTest = std::any_of(argv, argv + argc, [](const char* argument) {
        return std::string_view(argument).starts_with("--gtest_internal_run_death_test");
    });
    testing::InitGoogleTest(&argc, argv);
    if (argc >= 3) {
        wl_mutant = std::atoi(argv[1]);
    }
    if (argc < 3 || isDeathTest) {
        return RUN_ALL_TESTS();
    }
    for (char** name = argv + 2; *name; ++name) {
        const pid_t child = ::fork();
        if (child == 0) {
            runTest(*name);
        }
        int status = 0;
        ::waitpid(child, &status, 0);
        ::kill(-child, SIGKILL); // what a test has started and left
        if (status != 0) {
            const int number = WIFSIGNALED(status) ? WTERMSIG(status) : 0;
            const bool hung = number == SIGALRM || number == SIGXCPU || number == SIGKILL;
            std::printf("%s %s\n", hung ? "hung" : "killed", *name);
            return 0;
        }
    }
    std::printf("survived\n");
    return 0;
}
