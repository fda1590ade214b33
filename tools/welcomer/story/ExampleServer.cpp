#include "tools/welcomer/story/ExampleServer.h"

#include "backends/accountserver/Protocol.h"
#include "tools/welcomer/cli/ToolBundle.h"
#include "tools/welcomer/terminal/Failure.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <system_error>
#include <unistd.h>

namespace welcomer::tool {

namespace {

namespace fs = std::filesystem;

constexpr char kProgram[] = "welcomer-account-server";
constexpr char kListening[] = "listening "; // how the line begins that says that it can be asked
constexpr int kNotExecuted = 127;           // a status, as shells have it
constexpr int kLongestStart = 10'000;       // milliseconds without a word

// In the new process.
[[noreturn]] void beServer(const fs::path& program, const fs::path& root, pid_t parent, int output) {
    // Whoever ends the tool ends its server.
    if (::prctl(PR_SET_PDEATHSIG, SIGTERM) != 0 || ::getppid() != parent) {
        ::_exit(kNotExecuted);
    }
    for (const int each : {STDOUT_FILENO, STDERR_FILENO}) {
        ::dup2(output, each);
    }
    ::dup2(::open("/dev/null", O_RDONLY | O_CLOEXEC), STDIN_FILENO);
    ::execl(program.c_str(), kProgram, "--root", root.c_str(), nullptr);
    ::_exit(kNotExecuted);
}

CommandFailure notStarted(const std::string& why) {
    return CommandFailure("the account server does not start: " + why);
}

} // namespace

fs::path findAccountServer() {
    std::string looked;
    for (const ToolFolders& folders : toolFolders()) {
        fs::path program = (folders.services / kProgram).lexically_normal();
        if (::access(program.c_str(), X_OK) == 0) {
            return program;
        }
        looked += (looked.empty() ? "" : " or ") + program.string();
    }
    throw CommandFailure("the account server is not installed: there is no " + looked);
}

ExampleServer::ExampleServer(const fs::path& program, const fs::path& root, InterruptionGuard& guard)
    : _address("unix:" + root.string() + accountserver::kSocketPath) {
    std::array<int, 2> ends = {-1, -1};
    if (::pipe2(ends.data(), O_CLOEXEC) != 0) {
        throw notStarted(std::generic_category().message(errno));
    }
    _output = posix::FileDescriptor(ends[0]);
    posix::FileDescriptor input(ends[1]);
    ::fcntl(_output.get(), F_SETFL, O_NONBLOCK);
    const pid_t parent = ::getpid();
    _process = ::fork();
    if (_process < 0) {
        throw notStarted(std::generic_category().message(errno));
    }
    if (_process == 0) {
        guard.release();
        beServer(program, root, parent, input.get());
    }
    input = posix::FileDescriptor();
    while (!_text.starts_with(kListening) &&
           _text.find(std::string("\n") + kListening) == std::string::npos) {
        std::array<pollfd, 2> waiting{{{_output.get(), POLLIN, 0}, {guard.descriptor(), POLLIN, 0}}};
        ::poll(waiting.data(), waiting.size(), kLongestStart);
        if (waiting[1].revents != 0) {
            _end();
            throw Interrupted();
        }
        if (waiting[0].revents == 0 || !_read()) {
            _end();
            throw notStarted(_text.empty() ? "it says nothing" : _text.substr(0, _text.find('\n')));
        }
    }
}

ExampleServer::~ExampleServer() {
    _end();
}

std::vector<std::string> ExampleServer::newLines() {
    while (_read()) {
    }
    std::vector<std::string> lines;
    for (std::size_t end = _text.find('\n'); end != std::string::npos; end = _text.find('\n')) {
        lines.push_back(_text.substr(0, end));
        _text.erase(0, end + 1);
    }
    return lines;
}

// Takes what there is of the output.
//  result  whether there was anything
bool ExampleServer::_read() {
    std::array<char, 4096> buffer;
    const ssize_t count = ::read(_output.get(), buffer.data(), buffer.size());
    if (count > 0) {
        _text.append(buffer.data(), static_cast<std::size_t>(count));
    }
    return count > 0;
}

void ExampleServer::_end() const {
    ::kill(_process, SIGTERM);
    while (::waitpid(_process, nullptr, 0) < 0 && errno == EINTR) {
    }
}

} // namespace welcomer::tool
