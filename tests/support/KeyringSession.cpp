#include "tests/support/KeyringSession.h"

#include <chrono>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <thread>
#include <utility>

namespace welcomer {

namespace {

constexpr int kPatience = 60'000; // milliseconds, on a busy machine

[[noreturn]] void become(const std::vector<std::string>& command, int input, int output) {
    ::dup2(input, 0);
    ::dup2(output, 1);
    // When the test dies, so does this.
    ::prctl(PR_SET_PDEATHSIG, SIGTERM);
    std::vector<char*> arguments;
    for (const std::string& argument : command) {
        arguments.push_back(const_cast<char*>(argument.c_str()));
    }
    arguments.push_back(nullptr);
    ::execvp(arguments.front(), arguments.data());
    ::_exit(127);
}

pid_t start(const std::vector<std::string>& command, const std::string& input, int& output) {
    int toChild[2];
    int fromChild[2];
    if (::pipe2(toChild, O_CLOEXEC) != 0 || ::pipe2(fromChild, O_CLOEXEC) != 0) {
        throw std::runtime_error("no pipe");
    }
    const pid_t process = ::fork();
    if (process == 0) {
        become(command, toChild[0], fromChild[1]);
    }
    ::close(toChild[0]);
    ::close(fromChild[1]);
    const ssize_t written = ::write(toChild[1], input.data(), input.size());
    ::close(toChild[1]);
    output = fromChild[0];
    if (process < 0 || written != static_cast<ssize_t>(input.size())) {
        throw std::runtime_error("cannot start " + command.front());
    }
    return process;
}

void setVariable(const char* name, const std::string& value) {
    ::setenv(name, value.c_str(), 1);
}

} // namespace

Daemon::Daemon(const std::vector<std::string>& command, const std::string& input, const std::string& expect) {
    _process = start(command, input, _output);
    if (!expect.empty() && !waitForLine(expect)) {
        stop();
        throw std::runtime_error(command.front() + " does not say " + expect);
    }
}

Daemon::Daemon(Daemon&& other) noexcept {
    *this = std::move(other);
}

Daemon& Daemon::operator=(Daemon&& other) noexcept {
    std::swap(_process, other._process);
    std::swap(_output, other._output);
    std::swap(_answer, other._answer);
    std::swap(_unread, other._unread);
    return *this;
}

bool Daemon::waitForLine(const std::string& text) {
    for (;;) {
        for (std::size_t end = _unread.find('\n'); end != std::string::npos; end = _unread.find('\n')) {
            const std::string line = _unread.substr(0, end);
            _unread.erase(0, end + 1);
            if (line.starts_with(text)) {
                _answer = line.substr(text.size());
                return true;
            }
        }
        struct pollfd waiting = {_output, POLLIN, 0};
        char buffer[4096];
        if (::poll(&waiting, 1, kPatience) != 1) {
            return false;
        }
        const ssize_t count = ::read(_output, buffer, sizeof(buffer));
        if (count <= 0) {
            return false;
        }
        _unread.append(buffer, static_cast<std::size_t>(count));
    }
}

void Daemon::stop() {
    if (_process > 0) {
        ::kill(_process, SIGTERM);
        ::kill(_process, SIGCONT);
        ::waitpid(_process, nullptr, 0);
        ::close(_output);
        _process = -1;
    }
}

void Daemon::kill() {
    if (_process > 0) {
        ::kill(_process, SIGKILL);
    }
    stop();
}

void Daemon::hold(bool isHeld) const {
    ::kill(_process, isHeld ? SIGSTOP : SIGCONT);
}

KeyringSession::KeyringSession() {
    _folder.addDirectory("/home/.local/share"); // the keyring makes its own folder there, and no more
    _folder.addDirectory("/run");
    std::filesystem::permissions(_folder.locate("/run"), std::filesystem::perms::owner_all);
    for (const char* name : {"HOME", "XDG_RUNTIME_DIR", "XDG_DATA_HOME", "DBUS_SESSION_BUS_ADDRESS",
                             "DISPLAY", "WAYLAND_DISPLAY"}) {
        const char* const value = ::getenv(name);
        _environment.emplace_back(name, value ? value : "");
        ::unsetenv(name);
    }
    setVariable("HOME", _folder.locate("/home"));
    setVariable("XDG_RUNTIME_DIR", _folder.locate("/run"));
    _bus = Daemon({"dbus-daemon", "--session", "--nofork", "--print-address",
                   "--address=unix:dir=" + _folder.locate("/run")},
                  "", "unix:");
    setVariable("DBUS_SESSION_BUS_ADDRESS", "unix:" + _bus.answer());
}

KeyringSession::~KeyringSession() {
    _keyring.stop();
    _bus.stop();
    for (const auto& [name, value] : _environment) {
        value.empty() ? ::unsetenv(name.c_str()) : ::setenv(name.c_str(), value.c_str(), 1);
    }
}

void KeyringSession::startKeyring() {
    _keyring =
        Daemon({"gnome-keyring-daemon", "--foreground", "--unlock", "--components=secrets"}, kPassword, "");
    _waitForKeyring({"/org/freedesktop/secrets/collection/login", "--method",
                     "org.freedesktop.DBus.Properties.Get", "org.freedesktop.Secret.Collection", "Locked"},
                    "(<false>,)");
}

void KeyringSession::startEmptyKeyring() {
    _keyring = Daemon({"gnome-keyring-daemon", "--foreground", "--start", "--components=secrets"}, "", "");
    _waitForKeyring(
        {"/org/freedesktop/secrets", "--method", "org.freedesktop.Secret.Service.ReadAlias", "default"},
        "(objectpath");
}

// A call that starts nothing, until its answer begins as it should.
void KeyringSession::_waitForKeyring(const std::vector<std::string>& call, const std::string& expect) const {
    const std::vector<std::string> owner = {"gdbus",
                                            "call",
                                            "--session",
                                            "--dest",
                                            "org.freedesktop.DBus",
                                            "--object-path",
                                            "/org/freedesktop/DBus",
                                            "--method",
                                            "org.freedesktop.DBus.NameHasOwner",
                                            "org.freedesktop.secrets"};
    std::vector<std::string> command = {
        "gdbus", "call", "--session", "--dest", "org.freedesktop.secrets", "--object-path"};
    command.insert(command.end(), call.begin(), call.end());
    for (int attempt = 0; attempt < 1000; ++attempt) {
        if (outputOf(owner) == "(true,)" && outputOf(command).starts_with(expect)) {
            return;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
    throw std::runtime_error("the keyring does not come up");
}

std::string KeyringSession::keyringOwner() const {
    return outputOf({"gdbus", "call", "--session", "--dest", "org.freedesktop.DBus", "--object-path",
                     "/org/freedesktop/DBus", "--method", "org.freedesktop.DBus.GetNameOwner",
                     "org.freedesktop.secrets"});
}

void KeyringSession::lockKeyring() {
    outputOf({"gdbus", "call", "--session", "--dest", "org.freedesktop.secrets", "--object-path",
              "/org/freedesktop/secrets", "--method", "org.freedesktop.Secret.Service.Lock",
              "['/org/freedesktop/secrets/collection/login']"});
}

Daemon KeyringSession::startPrompter(const std::string& answer) const {
    return Daemon({"/usr/bin/python3", WELCOMER_PROMPTER, answer, kPassword}, "", "ready");
}

std::string outputOf(const std::vector<std::string>& command) {
    int output = -1;
    const pid_t process = start(command, "", output);
    std::string text;
    char buffer[4096];
    for (ssize_t count = ::read(output, buffer, sizeof(buffer)); count > 0;
         count = ::read(output, buffer, sizeof(buffer))) {
        text.append(buffer, static_cast<std::size_t>(count));
    }
    ::close(output);
    ::waitpid(process, nullptr, 0);
    if (text.ends_with('\n')) {
        text.pop_back();
    }
    return text;
}

} // namespace welcomer
