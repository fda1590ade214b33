#include "tools/launch-agents/UserManagerStarter.h"

#include "propertylist/Characters.h"

#include <chrono>
#include <system_error>
#include <systemd/sd-bus.h>
#include <systemd/sd-daemon.h>

namespace welcomer::launch {

namespace {

constexpr const char* kManager = "org.freedesktop.systemd1";

struct DropMessage {
    void operator()(sd_bus_message* message) const { sd_bus_message_unref(message); }
};
using Message = std::unique_ptr<sd_bus_message, DropMessage>;

// An error of one call, freed at its end.
class CallError {
  public:
    CallError() = default;
    ~CallError() { sd_bus_error_free(&_error); }
    CallError(const CallError&) = delete;
    CallError& operator=(const CallError&) = delete;

    sd_bus_error* get() { return &_error; }

    // What went wrong in a call with this negative result.
    platform::Error asError(int result) const {
        return {-result, _error.message ? _error.message : std::generic_category().message(-result)};
    }

  private:
    sd_bus_error _error{};
};

bool isPlainInUnitName(char character) {
    return isLetterOrDigit(character) || character == '.' || character == '_' || character == '-' ||
           character == ':';
}

// One property whose value is a text.
int appendText(sd_bus_message* message, const char* name, const char* value) {
    return sd_bus_message_append(message, "(sv)", name, "s", value);
}

// What the service runs. "no-env-expand": a dollar sign in an argument is one.
int appendCommand(sd_bus_message* message, const LaunchAgent& agent) {
    std::vector<char*> arguments;
    for (const std::string& argument : agent.arguments) {
        arguments.push_back(const_cast<char*>(argument.c_str()));
    }
    arguments.push_back(nullptr);
    int result = sd_bus_message_open_container(message, 'r', "sv");
    const auto then = [&](int next) {
        result = result < 0 ? result : next;
    };
    then(sd_bus_message_append(message, "s", "ExecStartEx"));
    then(sd_bus_message_open_container(message, 'v', "a(sasas)"));
    then(sd_bus_message_open_container(message, 'a', "(sasas)"));
    then(sd_bus_message_open_container(message, 'r', "sasas"));
    then(sd_bus_message_append(message, "s", agent.program.c_str()));
    then(sd_bus_message_append_strv(message, arguments.data()));
    then(sd_bus_message_append(message, "as", 1, "no-env-expand"));
    for (int open = 0; open < 4; ++open) {
        then(sd_bus_message_close_container(message));
    }
    return result;
}

// The whole request; a message that has failed once fails on.
int appendUnit(sd_bus_message* message, const LaunchAgent& agent) {
    int result = sd_bus_message_append(message, "ss", unitName(agent.label).c_str(), "fail");
    const auto then = [&](int next) {
        result = result < 0 ? result : next;
    };
    then(sd_bus_message_open_container(message, 'a', "(sv)"));
    then(appendText(message, "Description", ("Launch agent " + agent.label).c_str()));
    // Also one that failed goes away, so that the next login can start it again.
    then(appendText(message, "CollectMode", "inactive-or-failed"));
    then(appendCommand(message, agent));
    then(sd_bus_message_close_container(message));
    then(sd_bus_message_append(message, "a(sa(sv))", 0));
    return result;
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

void UserManagerStarter::CloseBus::operator()(sd_bus* bus) const {
    sd_bus_flush_close_unref(bus);
}

UserManagerStarter::Bus UserManagerStarter::_sessionBus() {
    sd_bus* bus = nullptr;
    return sd_bus_open_user(&bus) < 0 ? nullptr : Bus(bus);
}

UserManagerStarter::Bus UserManagerStarter::_busAt(const std::string& address) {
    sd_bus* made = nullptr;
    if (sd_bus_new(&made) < 0) {
        return nullptr;
    }
    Bus bus(made);
    const bool connected = sd_bus_set_address(made, address.c_str()) >= 0 &&
                           sd_bus_set_bus_client(made, 1) >= 0 && sd_bus_start(made) >= 0;
    return connected ? std::move(bus) : nullptr;
}

bool UserManagerStarter::_hasUserManager(sd_bus* bus) {
    CallError error;
    sd_bus_message* answer = nullptr;
    const int called =
        sd_bus_call_method(bus, "org.freedesktop.DBus", "/org/freedesktop/DBus", "org.freedesktop.DBus",
                           "NameHasOwner", error.get(), &answer, "s", kManager);
    const Message owned(answer);
    int hasOwner = 0;
    return called >= 0 && sd_bus_message_read(answer, "b", &hasOwner) >= 0 && hasOwner != 0;
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
    while (asked >= 0 && !_hasUserManager(bus)) {
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
    Bus bus = _sessionBus();
    if (bus && _hasUserManager(bus.get())) {
        return std::unique_ptr<UserManagerStarter>(new UserManagerStarter(std::move(bus)));
    }
    // A session may have a bus of its own, which the user manager is not on.
    bus = runtimeFolder.starts_with('/') ? _busAt("unix:path=" + runtimeFolder + "/bus") : nullptr;
    if (bus && (::sd_booted() > 0 ? _waitForUserManager(bus.get()) : _hasUserManager(bus.get()))) {
        return std::unique_ptr<UserManagerStarter>(new UserManagerStarter(std::move(bus)));
    }
    return nullptr;
}

platform::Outcome UserManagerStarter::start(const LaunchAgent& agent) {
    sd_bus_message* made = nullptr;
    int result = sd_bus_message_new_method_call(_bus.get(), &made, kManager, "/org/freedesktop/systemd1",
                                                "org.freedesktop.systemd1.Manager", "StartTransientUnit");
    const Message request(made);
    CallError error;
    if (result >= 0) {
        result = appendUnit(made, agent);
    }
    if (result >= 0) {
        result = sd_bus_call(_bus.get(), made, 0, error.get(), nullptr);
    }
    return result < 0 ? platform::Outcome::failure(error.asError(result)) : platform::Outcome::success();
}

} // namespace welcomer::launch
