#include "tests/support/NetworkManagerDaemon.h"

#include "tests/support/NetworkNamespace.h"

#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <fstream>
#include <stdexcept>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <system_error>
#include <unistd.h>

namespace welcomer {

namespace {

constexpr char kBusConfiguration[] = R"(<busconfig>
  <type>system</type>
  <listen>unix:path=/run/dbus/system_bus_socket</listen>
  <auth>EXTERNAL</auth>
  <policy context="default">
    <allow user="*"/>
    <allow own="*"/>
    <allow send_type="method_call"/>
    <allow send_type="signal"/>
    <allow send_requested_reply="true" send_type="method_return"/>
    <allow send_requested_reply="true" send_type="error"/>
    <allow receive_type="method_call"/>
    <allow receive_type="signal"/>
    <allow receive_requested_reply="true" receive_type="method_return"/>
    <allow receive_requested_reply="true" receive_type="error"/>
  </policy>
</busconfig>
)";

std::string managerConfiguration(const std::string& portalURL) {
    std::string text = R"([main]
plugins=keyfile
dns=none
rc-manager=unmanaged
no-auto-default=*
auth-polkit=root-only
[keyfile]
path=/run/profiles
unmanaged-devices=interface-name:p-*
)";
    if (!portalURL.empty()) {
        text += "[connectivity]\nuri=" + portalURL + "\nresponse=no portal here\ninterval=300\n";
    }
    return text;
}

void write(const std::string& path, const std::string& text) {
    std::ofstream(path) << text;
}

} // namespace

pid_t startProgram(const std::string& command) {
    const pid_t parent = ::getpid();
    const pid_t process = ::fork();
    if (process < 0) {
        throw std::system_error(errno, std::generic_category(), command);
    }
    if (process == 0) {
        ::prctl(PR_SET_PDEATHSIG, SIGKILL);
        const int nothing = ::open("/dev/null", O_RDWR);
        ::dup2(nothing, STDIN_FILENO);
        ::dup2(nothing, STDOUT_FILENO);
        if (::getppid() == parent) {
            ::execl("/bin/sh", "sh", "-c", ("exec " + command).c_str(), nullptr);
        }
        ::_exit(127);
    }
    return process;
}

void stopProgram(pid_t& process) {
    if (process > 0) {
        ::kill(process, SIGKILL);
        ::waitpid(process, nullptr, 0);
        process = -1;
    }
}

void waitFor(const std::string& command) {
    shell("n=0; until " + command +
          " >/dev/null 2>&1; do n=$((n+1)); [ $n -lt 1200 ] || exit 1; sleep 0.05; done");
}

void waitForManaged(const std::string& device) {
    waitFor("nmcli -g GENERAL.STATE device show " + device + " | grep -q '^[23]0\\|^100'");
}

NetworkManagerDaemon::NetworkManagerDaemon(const std::string& portalURL) {
    shell("mount -t tmpfs tmpfs /run && mkdir -p /run/dbus /run/profiles /var/lib/NetworkManager && "
          "mount -t tmpfs tmpfs /var/lib/NetworkManager && mount -t sysfs -o ro sysfs /sys");
    write("/run/bus.conf", kBusConfiguration);
    write("/run/manager.conf", managerConfiguration(portalURL));
    _bus = startProgram("dbus-daemon --config-file=/run/bus.conf --nofork --nopidfile");
    waitFor("test -S /run/dbus/system_bus_socket");
    _manager = startProgram(
        "NetworkManager --debug --log-level=INFO --config=/run/manager.conf --config-dir=/run/none "
        "--system-config-dir=/run/none --intern-config=/run/intern.conf "
        "--state-file=/run/state --pid-file=/run/manager.pid 2>/run/manager.log");
    waitFor("nmcli -t general status");
}

NetworkManagerDaemon::~NetworkManagerDaemon() {
    stop();
    stopBus();
}

void NetworkManagerDaemon::stop() {
    stopProgram(_manager);
}

void NetworkManagerDaemon::stopBus() {
    stopProgram(_bus);
}

void NetworkManagerDaemon::hold(bool isHeld) {
    ::kill(_manager, isHeld ? SIGSTOP : SIGCONT);
}

NeighbourNetwork::NeighbourNetwork() : _keeper(startProgram("unshare --net sleep infinity")) {
    const std::string own = shell("readlink /proc/self/ns/net | tr -d '\\n'");
    waitFor("test \"$(readlink /proc/" + std::to_string(_keeper) + "/ns/net)\" != \"" + own + "\"");
    shell("ip link set lo up");
}

NeighbourNetwork::~NeighbourNetwork() {
    for (pid_t process : _started) {
        if (::waitpid(process, nullptr, WNOHANG) == 0) { // else it has been stopped, or has ended
            stopProgram(process);
        }
    }
    stopProgram(_keeper);
}

void NeighbourNetwork::take(const std::string& link) const {
    welcomer::shell("ip link set " + link + " netns " + std::to_string(_keeper));
}

std::string NeighbourNetwork::command(const std::string& simple) const {
    return "nsenter --net=/proc/" + std::to_string(_keeper) + "/ns/net " + simple;
}

std::string NeighbourNetwork::shell(const std::string& text) const {
    return welcomer::shell(command("sh -c '" + text + "'"));
}

pid_t NeighbourNetwork::start(const std::string& text) {
    return _started.emplace_back(startProgram(command(text)));
}

} // namespace welcomer
