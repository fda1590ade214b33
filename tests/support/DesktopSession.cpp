#include "tests/support/DesktopSession.h"

#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <gio/gio.h>
#include <stdexcept>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <utility>

namespace welcomer {

namespace {

using namespace std::chrono_literals;

constexpr char kBus[] = "/usr/bin/dbus-daemon";
constexpr char kKeyring[] = "/usr/bin/gnome-keyring-daemon";
constexpr char kOnlineAccounts[] = "/usr/libexec/goa-daemon";
constexpr char kOnlineAccountsName[] = "org.gnome.OnlineAccounts";
constexpr auto kTooLong = 60s;

void write(const std::string& path, const std::string& content) {
    std::ofstream(path, std::ios::binary) << content;
}

void waitUntil(const std::string& what, const auto& condition) {
    const auto end = std::chrono::steady_clock::now() + kTooLong;
    while (!condition()) {
        if (std::chrono::steady_clock::now() > end) {
            throw std::runtime_error(what + " did not come up");
        }
        std::this_thread::sleep_for(5ms);
    }
}

bool canConnect(const std::string& path) {
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    path.copy(address.sun_path, sizeof address.sun_path - 1);
    const int file = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const bool isServed = ::connect(file, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
    ::close(file);
    return isServed;
}

} // namespace

DesktopSession::DesktopSession(std::string folder)
    : _folder(std::move(folder)),
      _home(_folder + "/home"),
      _runtime(_folder + "/run") {
    for (const std::string& path : {_home, _runtime, _folder + "/services"}) {
        std::filesystem::create_directories(path);
        std::filesystem::permissions(path, std::filesystem::perms::owner_all);
    }
    const std::map<std::string, std::string> environment = {
        {"HOME", _home},
        {"XDG_RUNTIME_DIR", _runtime},
        {"DBUS_SESSION_BUS_ADDRESS", "unix:path=" + _runtime + "/bus"},
        {"GSETTINGS_BACKEND", "memory"},
        {"GIO_USE_VFS", "local"},
        {"GIO_USE_NETWORK_MONITOR", "base"},
        {"GVFS_DISABLE_FUSE", "1"},
    };
    for (const auto& [name, value] : environment) {
        ::setenv(name.c_str(), value.c_str(), 1);
    }
    for (const char* name : {"XDG_CONFIG_HOME", "XDG_DATA_HOME", "XDG_CACHE_HOME", "DISPLAY",
                             "WAYLAND_DISPLAY", "GNOME_KEYRING_CONTROL", "SSH_AUTH_SOCK"}) {
        ::unsetenv(name);
    }
}

DesktopSession::~DesktopSession() {
    for (const char* name : {"online-accounts", "keyring", "bus"}) {
        _kill(name);
    }
}

std::vector<std::string> DesktopSession::missingPrograms() {
    std::vector<std::string> missing;
    for (const char* program : {kBus, kKeyring, kOnlineAccounts}) {
        if (::access(program, X_OK) != 0) {
            missing.emplace_back(program);
        }
    }
    return missing;
}

void DesktopSession::startBus() {
    const std::string socket = _runtime + "/bus";
    std::filesystem::remove(socket);
    write(_folder + "/bus.conf",
          "<!DOCTYPE busconfig PUBLIC \"-//freedesktop//DTD D-BUS Bus Configuration 1.0//EN\"\n"
          " \"http://www.freedesktop.org/standards/dbus/1.0/busconfig.dtd\">\n"
          "<busconfig><type>session</type><listen>unix:path=" +
              socket + "</listen><servicedir>" + _folder +
              "/services</servicedir><policy context=\"default\"><allow send_destination=\"*\"/>"
              "<allow receive_sender=\"*\"/><allow own=\"*\"/></policy></busconfig>\n");
    _start("bus", {kBus, "--nofork", "--config-file=" + _folder + "/bus.conf"}, "");
    waitUntil("the bus", [&] { return canConnect(socket); });
}

void DesktopSession::startKeyring() {
    _start("keyring", {kKeyring, "--foreground", "--unlock", "--components=secrets"}, "password");
    _waitForName("org.freedesktop.secrets");
}

void DesktopSession::startOnlineAccounts() {
    _start("online-accounts", {kOnlineAccounts}, "");
    _waitForName(kOnlineAccountsName);
}

void DesktopSession::letBusStartOnlineAccounts() {
    write(_folder + "/services/org.gnome.OnlineAccounts.service",
          std::string("[D-BUS Service]\nName=") + kOnlineAccountsName + "\nExec=" + kOnlineAccounts + "\n");
}

void DesktopSession::freezeOnlineAccounts() const {
    ::kill(_daemons.at("online-accounts"), SIGSTOP);
}

void DesktopSession::thawOnlineAccounts() const {
    ::kill(_daemons.at("online-accounts"), SIGCONT);
}

void DesktopSession::_start(const std::string& name, const std::vector<std::string>& command,
                            const std::string& input) {
    int files[2] = {};
    if (::pipe2(files, O_CLOEXEC) != 0 ||
        ::write(files[1], input.data(), input.size()) != static_cast<ssize_t>(input.size())) {
        throw std::runtime_error("no pipe");
    }
    std::vector<char*> arguments;
    for (const std::string& argument : command) {
        arguments.push_back(const_cast<char*>(argument.c_str()));
    }
    arguments.push_back(nullptr);
    const std::string log = _folder + "/" + name + ".log";
    const pid_t parent = ::getpid();
    const pid_t daemon = ::fork();
    if (daemon == 0) {
        ::prctl(PR_SET_PDEATHSIG, SIGKILL);
        const int output = ::open(log.c_str(), O_WRONLY | O_CREAT | O_APPEND, 0600);
        ::dup2(files[0], STDIN_FILENO);
        ::dup2(output, STDOUT_FILENO);
        ::dup2(output, STDERR_FILENO);
        if (::getppid() == parent) {
            ::execv(arguments[0], arguments.data());
        }
        ::_exit(127);
    }
    ::close(files[0]);
    ::close(files[1]);
    _daemons[name] = daemon;
}

void DesktopSession::_waitForName(const std::string& busName) {
    GDBusConnection* const bus = g_dbus_connection_new_for_address_sync(
        ("unix:path=" + _runtime + "/bus").c_str(),
        static_cast<GDBusConnectionFlags>(G_DBUS_CONNECTION_FLAGS_AUTHENTICATION_CLIENT |
                                          G_DBUS_CONNECTION_FLAGS_MESSAGE_BUS_CONNECTION),
        nullptr, nullptr, nullptr);
    if (!bus) {
        throw std::runtime_error("the bus cannot be reached");
    }
    waitUntil(busName, [&] {
        GVariant* const answer = g_dbus_connection_call_sync(
            bus, "org.freedesktop.DBus", "/", "org.freedesktop.DBus", "NameHasOwner",
            g_variant_new("(s)", busName.c_str()), nullptr, G_DBUS_CALL_FLAGS_NONE, -1, nullptr, nullptr);
        gboolean isOwned = FALSE;
        if (answer) {
            g_variant_get(answer, "(b)", &isOwned);
            g_variant_unref(answer);
        }
        return isOwned != FALSE;
    });
    g_object_unref(bus);
}

void DesktopSession::_kill(const std::string& name) {
    const auto daemon = _daemons.find(name);
    if (daemon != _daemons.end()) {
        ::kill(daemon->second, SIGKILL);
        while (::waitpid(daemon->second, nullptr, 0) < 0 && errno == EINTR) {
        }
        _daemons.erase(daemon);
    }
}

} // namespace welcomer
