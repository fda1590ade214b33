#include "tools/launch-agents/UserManagerStarter.h"

#include "propertylist/Characters.h"

#include <chrono>
#include <systemd/sd-bus.h>
#include <systemd/sd-daemon.h>

namespace welcomer::launch {

namespace {

constexpr bus::Peer kUserManager = {"org.freedesktop.systemd1", "/org/freedesktop/systemd1",
                                    "org.freedesktop.systemd1.Manager", std::chrono::seconds(25)};

bool isPlainInUnitName(char character) {
    return isLetterOrDigit(character) || character == '.' || character == '_' || character == '-' ||
           character == ':';
}

// Adds what the service runs. "no-env-expand": a dollar sign in an argument is one.
void appendCommand(bus::Call& call, const LaunchAgent& agent) {
    call.open('r', "sv").append("s", "ExecStartEx").open('v', "a(sasas)").open('a', "(sasas)");
    call.open('r', "sasas").append("s", agent.program.c_str()).append(agent.arguments);
    call.append("as", 1, "no-env-expand").close(4);
}

} // namespace

std::string unitName(std::string_view label) {
    std::string name = "welcomer-agent-";
    for (const char character : label) {
        if (isPlainInUnitName(character)) {
            name += character;
        } else {
            name += "\\x";
            appendHex(name, static_cast<unsigned char>(character));
        }
    }
    return name + ".service";
}

bool UserManagerStarter::_waitForUserManager(sd_bus* bus) {
    using namespace std::chrono;
    // Signals are asked for before the first look, so that none is missed between the two; any message is a
    // reason to look again.
    const int asked =
        sd_bus_add_match(bus, nullptr,
                         "type='signal',sender='org.freedesktop.DBus',member='NameOwnerChanged',"
                         "arg0='org.freedesktop.systemd1'",
                         nullptr, nullptr);
    const auto end = steady_clock::now() + seconds(10);
    while (asked >= 0 && !bus::isRunning(bus, kUserManager)) {
        int processed = sd_bus_process(bus, nullptr);
        const auto left = duration_cast<microseconds>(end - steady_clock::now()).count();
        if (processed == 0 && left > 0) {
            processed = sd_bus_wait(bus, static_cast<std::uint64_t>(left));
        }
        if (processed < 0 || left <= 0) {
            return false;
        }
    }
    return asked >= 0;
}

std::unique_ptr<UserManagerStarter> UserManagerStarter::connect(const std::string& runtimeFolder) {
    bus::Bus bus = bus::openSessionBus();
    if (bus && bus::isRunning(bus.get(), kUserManager)) {
        return std::unique_ptr<UserManagerStarter>(new UserManagerStarter(std::move(bus)));
    }
    // A session may have a bus of its own, which the user manager is not on.
    bus = runtimeFolder.starts_with('/') ? bus::openBusAt("unix:path=" + runtimeFolder + "/bus") : nullptr;
    if (bus &&
        (::sd_booted() > 0 ? _waitForUserManager(bus.get()) : bus::isRunning(bus.get(), kUserManager))) {
        return std::unique_ptr<UserManagerStarter>(new UserManagerStarter(std::move(bus)));
    }
    return nullptr;
}

platform::Outcome UserManagerStarter::start(const LaunchAgent& agent) {
    bus::Call call(_bus.get(), kUserManager, "StartTransientUnit");
    call.append("ss", unitName(agent.label).c_str(), "fail").open('a', "(sv)");
    call.append("(sv)", "Description", "s", ("Launch agent " + agent.label).c_str());
    // Also one that failed goes away, so that the next login can start it again.
    call.append("(sv)", "CollectMode", "s", "inactive-or-failed");
    appendCommand(call, agent);
    return call.close().append("a(sa(sv))", 0).send();
}

} // namespace welcomer::launch
