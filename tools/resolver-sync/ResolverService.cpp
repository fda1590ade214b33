#include "tools/resolver-sync/ResolverService.h"

#include <arpa/inet.h>
#include <cerrno>
#include <cstdarg>
#include <cstring>
#include <string_view>
#include <sys/socket.h>
#include <system_error>
#include <systemd/sd-bus.h>

namespace welcomer::resolver {

namespace {

constexpr const char* kService = "org.freedesktop.resolve1";
constexpr const char* kPath = "/org/freedesktop/resolve1";
constexpr const char* kInterface = "org.freedesktop.resolve1.Manager";

struct DropMessage {
    void operator()(sd_bus_message* message) const { sd_bus_message_unref(message); }
};
using Message = std::unique_ptr<sd_bus_message, DropMessage>;

class CallError {
  public:
    CallError() = default;
    ~CallError() { sd_bus_error_free(&_error); }
    CallError(const CallError&) = delete;
    CallError& operator=(const CallError&) = delete;
    sd_bus_error* get() { return &_error; }

    // The outcome of a call with this result.
    platform::Outcome outcome(int result, const char* method) const {
        if (result >= 0) {
            return platform::Outcome::success();
        }
        const std::string reason = _error.message ? _error.message : std::generic_category().message(-result);
        return platform::Outcome::failure({-result, std::string(method) + ": " + reason});
    }

  private:
    sd_bus_error _error{};
};

Message newCall(sd_bus* bus, const char* method) {
    sd_bus_message* made = nullptr;
    sd_bus_message_new_method_call(bus, &made, kService, kPath, kInterface, method);
    if (made) {
        // Whoever does not run the service resolves names in another way, and is to go on doing so.
        sd_bus_message_set_auto_start(made, 0);
    }
    return Message(made);
}

platform::Outcome finish(sd_bus* bus, sd_bus_message* message, int built, const char* method) {
    CallError error;
    return error.outcome(built < 0 ? built : sd_bus_call(bus, message, 0, error.get(), nullptr), method);
}

int ownerChanged(sd_bus_message* message, void* userdata, sd_bus_error* /*error*/) {
    const char* name = nullptr;
    const char* before = nullptr;
    const char* now = nullptr;
    if (sd_bus_message_read(message, "sss", &name, &before, &now) >= 0 && *now != '\0') {
        (*static_cast<std::function<void(bool)>*>(userdata))(true);
    }
    return 0;
}

int busLost(sd_bus_message* /*message*/, void* userdata, sd_bus_error* /*error*/) {
    (*static_cast<std::function<void(bool)>*>(userdata))(false);
    return 0;
}

} // namespace

void ResolverService::CloseBus::operator()(sd_bus* bus) const {
    sd_bus_flush_close_unref(bus);
}

ResolverService::ResolverService(sd_event* event, std::function<void(bool running)> appeared)
    : _appeared(std::move(appeared)) {
    sd_bus* opened = nullptr;
    int result = sd_bus_open_system(&opened);
    _bus.reset(opened);
    const auto then = [&](auto next) {
        result = result < 0 ? result : next();
    };
    then([&] { return sd_bus_set_exit_on_disconnect(opened, 0); });
    then([&] { return sd_bus_attach_event(opened, event, 0); });
    then([&] {
        return sd_bus_add_match(opened, nullptr,
                                "type='signal',sender='org.freedesktop.DBus',member='NameOwnerChanged',"
                                "arg0='org.freedesktop.resolve1'",
                                ownerChanged, &_appeared);
    });
    then([&] {
        return sd_bus_add_match(opened, nullptr,
                                "type='signal',path='/org/freedesktop/DBus/Local',"
                                "interface='org.freedesktop.DBus.Local',member='Disconnected'",
                                busLost, &_appeared);
    });
    if (result < 0) {
        throw std::system_error(-result, std::generic_category(), "the system bus");
    }
}

ResolverService::~ResolverService() {
    sd_bus_detach_event(_bus.get());
}

bool ResolverService::isRunning() {
    sd_bus_message* answer = nullptr;
    int owned = 0;
    const int called =
        sd_bus_call_method(_bus.get(), "org.freedesktop.DBus", "/org/freedesktop/DBus",
                           "org.freedesktop.DBus", "NameHasOwner", nullptr, &answer, "s", kService);
    const Message held(answer);
    return called >= 0 && sd_bus_message_read(answer, "b", &owned) >= 0 && owned != 0;
}

bool ResolverService::hasDelegates() {
    sd_bus_message* answer = nullptr;
    const char* description = nullptr;
    const int called = sd_bus_call_method(_bus.get(), kService, kPath, "org.freedesktop.DBus.Introspectable",
                                          "Introspect", nullptr, &answer, "");
    const Message held(answer);
    return called >= 0 && sd_bus_message_read(answer, "s", &description) >= 0 &&
           std::string_view(description).find("\"ListDelegates\"") != std::string_view::npos;
}

platform::Outcome ResolverService::_call(const char* method, const char* types, ...) {
    const Message message = newCall(_bus.get(), method);
    va_list arguments;
    va_start(arguments, types);
    const int built = message ? sd_bus_message_appendv(message.get(), types, arguments) : -ENOMEM;
    va_end(arguments);
    return finish(_bus.get(), message.get(), built, method);
}

platform::Outcome ResolverService::_setNameserver(int link, const std::string& address, std::uint16_t port) {
    in_addr bytes{};
    ::inet_pton(AF_INET, address.c_str(), &bytes);
    const Message message = newCall(_bus.get(), "SetLinkDNSEx");
    int result = message ? 0 : -ENOMEM;
    const auto then = [&](auto next) {
        result = result < 0 ? result : next(message.get());
    };
    then([&](sd_bus_message* built) { return sd_bus_message_append(built, "i", link); });
    then([&](sd_bus_message* built) { return sd_bus_message_open_container(built, 'a', "(iayqs)"); });
    then([&](sd_bus_message* built) { return sd_bus_message_open_container(built, 'r', "iayqs"); });
    then([&](sd_bus_message* built) { return sd_bus_message_append(built, "i", AF_INET); });
    then(
        [&](sd_bus_message* built) { return sd_bus_message_append_array(built, 'y', &bytes, sizeof bytes); });
    then([&](sd_bus_message* built) { return sd_bus_message_append(built, "qs", port, ""); });
    then([&](sd_bus_message* built) { return sd_bus_message_close_container(built); });
    then([&](sd_bus_message* built) { return sd_bus_message_close_container(built); });
    return finish(_bus.get(), message.get(), result, "SetLinkDNSEx");
}

platform::Outcome ResolverService::_setDomains(int link, const std::vector<std::string>& domains) {
    const Message message = newCall(_bus.get(), "SetLinkDomains");
    int result = message ? 0 : -ENOMEM;
    const auto then = [&](auto next) {
        result = result < 0 ? result : next(message.get());
    };
    then([&](sd_bus_message* built) { return sd_bus_message_append(built, "i", link); });
    then([&](sd_bus_message* built) { return sd_bus_message_open_container(built, 'a', "(sb)"); });
    for (const std::string& domain : domains) {
        // Routing alone: short names are not looked up in it.
        then([&](sd_bus_message* built) { return sd_bus_message_append(built, "(sb)", domain.c_str(), 1); });
    }
    then([&](sd_bus_message* built) { return sd_bus_message_close_container(built); });
    return finish(_bus.get(), message.get(), result, "SetLinkDomains");
}

platform::Outcome ResolverService::routeLink(int link, const std::vector<std::string>& domains,
                                             const std::string& address, std::uint16_t port) {
    // What a forwarder on this machine cannot do, and what names of other domains are not to be asked with.
    platform::Outcome outcome = _call("SetLinkDNSOverTLS", "is", link, "no");
    const auto then = [&](auto next) {
        if (outcome) {
            outcome = next();
        }
    };
    then([&] { return _call("SetLinkDNSSEC", "is", link, "no"); });
    then([&] { return _call("SetLinkLLMNR", "is", link, "no"); });
    then([&] { return _call("SetLinkMulticastDNS", "is", link, "no"); });
    then([&] { return _call("SetLinkDefaultRoute", "ib", link, 0); });
    then([&] { return _setNameserver(link, address, port); });
    then([&] { return _setDomains(link, domains); });
    return outcome;
}

platform::Outcome ResolverService::flushCaches() {
    return _call("FlushCaches", "");
}

platform::Outcome ResolverService::reload() {
    CallError error;
    const int result = sd_bus_call_method(_bus.get(), "org.freedesktop.systemd1", "/org/freedesktop/systemd1",
                                          "org.freedesktop.systemd1.Manager", "ReloadUnit", error.get(),
                                          nullptr, "ss", "systemd-resolved.service", "replace");
    return error.outcome(result, "ReloadUnit");
}

} // namespace welcomer::resolver
