// Times two commands as whole processes, turn about, and prints the medians as JSON.
//   process-pair COUNT COMMAND [ARG ...] -- PEER [ARG ...]

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <vector>

extern char** environ;

namespace {

using Nanoseconds = long long;

// From before the process is made until it has been waited for, its output thrown away.
Nanoseconds timeOnce(char* const* command) {
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, 1, "/dev/null", O_WRONLY, 0);
    posix_spawn_file_actions_addopen(&actions, 2, "/dev/null", O_WRONLY, 0);
    const auto start = std::chrono::steady_clock::now();
    pid_t child = 0;
    if (const int number = posix_spawnp(&child, command[0], &actions, nullptr, command, environ)) {
        std::fprintf(stderr, "process-pair: %s: %s\n", command[0], std::strerror(number));
        std::exit(1);
    }
    int status = 0;
    waitpid(child, &status, 0);
    const auto end = std::chrono::steady_clock::now();
    posix_spawn_file_actions_destroy(&actions);
    if (!WIFEXITED(status)) {
        std::fprintf(stderr, "process-pair: %s ended by a signal\n", command[0]);
        std::exit(1);
    }
    return std::chrono::duration_cast<std::chrono::nanoseconds>(end - start).count();
}

Nanoseconds median(std::vector<Nanoseconds> values) {
    const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
    std::nth_element(values.begin(), middle, values.end());
    return *middle;
}

} // namespace

int main(int argc, char** argv) {
    char** const end = argv + argc;
    char** const separator =
        std::find_if(argv, end, [](const char* word) { return !std::strcmp(word, "--"); });
    const int count = argc > 1 ? std::atoi(argv[1]) : 0;
    if (count <= 0 || separator - argv < 3 || end - separator < 2) {
        std::fputs("usage: process-pair COUNT COMMAND [ARG ...] -- PEER [ARG ...]\n", stderr);
        return 2;
    }
    *separator = nullptr; // ends the first command's arguments
    std::vector<Nanoseconds> first, second;
    timeOnce(argv + 2);
    timeOnce(separator + 1);
    for (int i = 0; i < count; ++i) {
        first.push_back(timeOnce(argv + 2));
        second.push_back(timeOnce(separator + 1));
    }
    std::printf("{\"ns\": %lld, \"peer_ns\": %lld}\n", median(first), median(second));
    return 0;
}
