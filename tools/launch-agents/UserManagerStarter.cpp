#include "tools/launch-agents/UserManagerStarter.h"

#include <chrono>
#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <systemd/sd-bus.h>
#include <systemd/sd-daemon.h>
#include <utility>

namespace welcomer::launch {

namespace {

constexpr bus::Peer kUserManager = {"org.freedesktop.systemd1", "/org/freedesktop/systemd1",
                                    "org.freedesktop.systemd1.Manager", std::chrono::seconds(25)};

constexpr std::chrono::seconds kManagerPatience{10};

// Handles messages until a condition holds, which is looked at before the first and after each of them.
//  patience  how long to wait; none: for ever
//  result    whether it holds
bool waitUntil(sd_bus* bus, const std::function<bool()>& holds,
               std::optional<std::chrono::microseconds> patience) {
    using namespace std::chrono;
    const auto end = steady_clock::now() + patience.value_or(0us);
    while (!holds()) {
        const auto left = duration_cast<microseconds>(end - steady_clock::now()).count();
        if (patience && left <= 0) {
            return false;
        }
        int processed = sd_bus_process(bus, nullptr);
        if (processed == 0) {
            processed = sd_bus_wait(bus, patience ? static_cast<std::uint64_t>(left) : UINT64_MAX);
        }
        if (processed < 0) {
            return false;
        }
    }
    return true;
}

// A unit's property, with the answer at its variant; null where it cannot be asked.
bus::Message propertyOf(sd_bus* bus, const std::string& unit, const char* property,
                        const char* interface = "org.freedesktop.systemd1.Unit") {
    bus::Message answer;
    const bus::Peer peer = kUserManager.at(unit.c_str()).as("org.freedesktop.DBus.Properties");
    const platform::Outcome asked =
        bus::Call(bus, peer, "Get").append("ss", interface, property).send(&answer);
    return asked ? std::move(answer) : nullptr;
}

bool hasEnded(std::string_view subState) {
    return subState == "exited" || subState == "failed";
}

// Adds what the service runs. "no-env-expand": a dollar sign in an argument is one.
void appendCommand(bus::Call& call, const LaunchAgent& agent) {
    call.open('r', "sv").append("s", "ExecStartEx").open('v', "a(sasas)").open('a', "(sasas)");
    call.open('r', "sasas").append("s", agent.program.c_str()).append(agent.arguments);
    call.append("as", 1, "no-env-expand").close(4);
}

} // namespace

bool UserManagerStarter::_waitForUserManager(sd_bus* bus) {
    // Signals are asked for before the first look, so that none is missed between the two.
    const int asked =
        sd_bus_add_match(bus, nullptr,
                         "type='signal',sender='org.freedesktop.DBus',member='NameOwnerChanged',"
                         "arg0='org.freedesktop.systemd1'",
                         nullptr, nullptr);
    return asked >= 0 && waitUntil(
                             bus, [bus] { return bus::isRunning(bus, kUserManager); }, kManagerPatience);
}

std::unique_ptr<UserManagerStarter> UserManagerStarter::connect(const std::string& runtimeFolder) {
    bus::Bus bus = bus::openSessionBus(kUserManager.limit);
    if (bus && bus::isRunning(bus.get(), kUserManager)) {
        return std::unique_ptr<UserManagerStarter>(new UserManagerStarter(std::move(bus)));
    }
    // A session may have a bus of its own, which the user manager is not on.
    bus = runtimeFolder.starts_with('/')
              ? bus::openBusAt("unix:path=" + runtimeFolder + "/bus", kUserManager.limit)
              : nullptr;
    if (bus &&
        (::sd_booted() > 0 ? _waitForUserManager(bus.get()) : bus::isRunning(bus.get(), kUserManager))) {
        return std::unique_ptr<UserManagerStarter>(new UserManagerStarter(std::move(bus)));
    }
    return nullptr;
}

std::string UserManagerStarter::_unit(const std::string& name) {
    bus::Message answer;
    const char* path = nullptr;
    const bool isLoaded =
        bus::Call(_bus.get(), kUserManager, "GetUnit").append("s", name.c_str()).send(&answer) &&
        sd_bus_message_read(answer.get(), "o", &path) >= 0;
    return isLoaded ? path : "";
}

std::string UserManagerStarter::_subState(const std::string& unit) {
    const bus::Message value = propertyOf(_bus.get(), unit, "SubState");
    const char* text = nullptr;
    return value && sd_bus_message_read(value.get(), "v", "s", &text) >= 0 ? text : "";
}

std::string UserManagerStarter::_invocation(const std::string& unit) {
    const bus::Message value = propertyOf(_bus.get(), unit, "InvocationID");
    const void* bytes = nullptr;
    std::size_t size = 0;
    std::string invocation;
    if (value && sd_bus_message_enter_container(value.get(), 'v', "ay") >= 0 &&
        sd_bus_message_read_array(value.get(), 'y', &bytes, &size) >= 0) {
        for (const unsigned char byte : std::span(static_cast<const unsigned char*>(bytes), size)) {
            appendHex(invocation, byte);
        }
    }
    return invocation;
}

AgentRun UserManagerStarter::_run(const std::string& unit, std::string invocation) {
    constexpr const char* kService = "org.freedesktop.systemd1.Service";
    const bus::Message process = propertyOf(_bus.get(), unit, "ExecMainPID", kService);
    const bus::Message start = propertyOf(_bus.get(), unit, "ExecMainStartTimestampMonotonic", kService);
    std::uint32_t number = 0;
    std::uint64_t microseconds = 0;
    if (!process || sd_bus_message_read(process.get(), "v", "u", &number) < 0 || !start ||
        sd_bus_message_read(start.get(), "v", "t", &microseconds) < 0) {
        invocation.clear();
    }
    return {std::move(invocation), number, std::chrono::microseconds(microseconds)};
}

bool UserManagerStarter::_listen() {
    // Asked a second time, the manager refuses.
    _isListening = _isListening ||
                   (bus::Call(_bus.get(), kUserManager, "Subscribe").send() &&
                    sd_bus_add_match(_bus.get(), nullptr, "type='signal',sender='org.freedesktop.systemd1'",
                                     nullptr, nullptr) >= 0);
    return _isListening;
}

void UserManagerStarter::_removeEnded(const std::string& name) {
    const std::string unit = _unit(name);
    if (unit.empty() || !hasEnded(_subState(unit)) || !_listen()) {
        return;
    }
    // Of the two, one is for what ended well and one for what did not; whether it is gone shows by itself.
    static_cast<void>(
        bus::Call(_bus.get(), kUserManager, "StopUnit").append("ss", name.c_str(), "replace").send());
    static_cast<void>(
        bus::Call(_bus.get(), kUserManager, "ResetFailedUnit").append("s", name.c_str()).send());
    waitUntil(
        _bus.get(), [&] { return _unit(name).empty(); }, kManagerPatience);
}

platform::Outcome UserManagerStarter::start(const LaunchAgent& agent) {
    const std::string name = unitName(agent.label);
    _removeEnded(name);
    bus::Call call(_bus.get(), kUserManager, "StartTransientUnit");
    call.append("ss", name.c_str(), "fail").open('a', "(sv)");
    call.append("(sv)", "Description", "s", ("Launch agent " + agent.label).c_str());
    call.append("(sv)", "RemainAfterExit", "b", 1);
    appendCommand(call, agent);
    return call.close().append("a(sa(sv))", 0).send();
}

std::optional<AgentRun> UserManagerStarter::waitForEnd(const LaunchAgent& agent) {
    const std::string unit = _unit(unitName(agent.label));
    std::string invocation;
    // That it was accepted does not say that it runs already.
    const bool hasBegun = !unit.empty() && _listen() &&
                          waitUntil(
                              _bus.get(),
                              [&] {
                                  invocation = _invocation(unit);
                                  return !invocation.empty();
                              },
                              kManagerPatience);
    const auto isOver = [&] {
        const std::string state = _subState(unit);
        return state.empty() || state == "dead" || hasEnded(state);
    };
    if (!hasBegun || !waitUntil(_bus.get(), isOver, std::nullopt)) {
        return std::nullopt;
    }
    AgentRun run = _run(unit, _invocation(unit));
    // Somebody may have stopped it, or started it anew, meanwhile.
    return run.invocation == invocation && run.process != 0 ? std::optional(std::move(run)) : std::nullopt;
}

} // namespace welcomer::launch
