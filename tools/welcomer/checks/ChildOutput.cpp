#include "tools/welcomer/checks/ChildOutput.h"

#include "backends/posix/FileDescriptor.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sys/wait.h>
#include <system_error>
#include <unistd.h>

namespace welcomer::tool {

namespace {

using Clock = std::chrono::steady_clock;

constexpr std::size_t kMaximumOutput = std::size_t{4} * 1024 * 1024; // bytes

std::string errorText(int number) {
    return std::generic_category().message(number);
}

// Takes what comes until the end.
//  result  why there is more that was not taken; empty when there is not
std::string readUntil(int descriptor, Clock::time_point end, std::string& text) {
    std::array<char, 65536> buffer{};
    while (true) {
        const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(end - Clock::now()).count();
        pollfd waiting{descriptor, POLLIN, 0};
        const int ready = left > 0 ? ::poll(&waiting, 1, static_cast<int>(left)) : 0;
        if (ready == 0) {
            return "it takes too long";
        }
        const ssize_t count = ready < 0 ? -1 : ::read(descriptor, buffer.data(), buffer.size());
        if (count == 0) {
            return "";
        }
        if (count < 0 && errno != EINTR) {
            return errorText(errno);
        }
        text.append(buffer.data(), static_cast<std::size_t>(count > 0 ? count : 0));
        if (text.size() > kMaximumOutput) {
            return "it writes too much";
        }
    }
}

// Starts it with the pipe's end as its standard output.
//  result  0 or the system's error number
int start(const std::vector<std::string>& command, int output, pid_t& process) {
    std::vector<char*> arguments;
    arguments.reserve(command.size() + 1);
    for (const std::string& argument : command) {
        arguments.push_back(const_cast<char*>(argument.c_str()));
    }
    arguments.push_back(nullptr);
    posix_spawn_file_actions_t actions;
    ::posix_spawn_file_actions_init(&actions);
    ::posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    ::posix_spawn_file_actions_adddup2(&actions, output, STDOUT_FILENO);
    ::posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
    const int error =
        ::posix_spawnp(&process, arguments.front(), &actions, nullptr, arguments.data(), environ);
    ::posix_spawn_file_actions_destroy(&actions);
    return error;
}

} // namespace

ChildOutput outputOf(const std::vector<std::string>& command, std::chrono::milliseconds limit) {
    std::array<int, 2> pipe{};
    if (::pipe2(pipe.data(), O_CLOEXEC) != 0) {
        return {"", errorText(errno)};
    }
    const posix::FileDescriptor reader(pipe[0]);
    pid_t process = -1;
    int error = 0;
    {
        const posix::FileDescriptor writer(pipe[1]);
        error = start(command, writer.get(), process);
    }
    if (error != 0) {
        return {"", errorText(error)};
    }
    ChildOutput output;
    output.trouble = readUntil(reader.get(), Clock::now() + limit, output.text);
    if (!output.trouble.empty()) {
        ::kill(process, SIGKILL);
    }
    int status = 0;
    while (::waitpid(process, &status, 0) < 0 && errno == EINTR) {
    }
    if (output.trouble.empty() && WIFSIGNALED(status)) {
        output.trouble = std::string("it ended by a signal: ") + ::strsignal(WTERMSIG(status));
    }
    return output;
}

} // namespace welcomer::tool
