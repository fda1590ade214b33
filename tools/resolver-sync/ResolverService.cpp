#include "tools/resolver-sync/ResolverService.h"

#include <arpa/inet.h>
#include <string_view>
#include <sys/socket.h>
#include <system_error>
#include <systemd/sd-bus.h>

namespace welcomer::resolver {

namespace {

// Whoever does not run it resolves names in another way, and is to go on doing so: no call starts it.
constexpr bus::Peer kResolver = {"org.freedesktop.resolve1", "/org/freedesktop/resolve1",
                                 "org.freedesktop.resolve1.Manager", std::chrono::seconds(25)};
constexpr bus::Peer kIntrospection = kResolver.as("org.freedesktop.DBus.Introspectable");
constexpr bus::Peer kServiceManager = {"org.freedesktop.systemd1", "/org/freedesktop/systemd1",
                                       "org.freedesktop.systemd1.Manager", std::chrono::seconds(25)};

// Sends a call whose failure is to name its method.
platform::Outcome send(bus::Call& call, const char* method) {
    platform::Outcome outcome = call.send();
    if (!outcome) {
        outcome.error.message = std::string(method) + ": " + outcome.error.message;
    }
    return outcome;
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
    return bus::isRunning(_bus.get(), kResolver);
}

bool ResolverService::hasDelegates() {
    bus::Message answer;
    const char* description = nullptr;
    return bus::Call(_bus.get(), kIntrospection, "Introspect").send(&answer) &&
           sd_bus_message_read(answer.get(), "s", &description) >= 0 &&
           std::string_view(description).find("\"ListDelegates\"") != std::string_view::npos;
}

platform::Outcome ResolverService::_setText(const char* method, int link, const char* text) {
    bus::Call call(_bus.get(), kResolver, method);
    return send(call.append("is", link, text), method);
}

platform::Outcome ResolverService::_keepFromBeingTheDefault(int link) {
    bus::Call call(_bus.get(), kResolver, "SetLinkDefaultRoute");
    return send(call.append("ib", link, 0), "SetLinkDefaultRoute");
}

platform::Outcome ResolverService::_setNameserver(int link, const std::string& address, std::uint16_t port) {
    in_addr bytes{};
    ::inet_pton(AF_INET, address.c_str(), &bytes);
    bus::Call call(_bus.get(), kResolver, "SetLinkDNSEx");
    call.append("i", link).open('a', "(iayqs)").open('r', "iayqs").append("i", AF_INET);
    call.appendBytes(&bytes, sizeof bytes).append("qs", port, "").close(2);
    return send(call, "SetLinkDNSEx");
}

platform::Outcome ResolverService::_setDomains(int link, const std::vector<std::string>& domains) {
    bus::Call call(_bus.get(), kResolver, "SetLinkDomains");
    call.append("i", link).open('a', "(sb)");
    for (const std::string& domain : domains) {
        // Routing alone: short names are not looked up in it.
        call.append("(sb)", domain.c_str(), 1);
    }
    return send(call.close(), "SetLinkDomains");
}

platform::Outcome ResolverService::routeLink(int link, const std::vector<std::string>& domains,
                                             const std::string& address, std::uint16_t port) {
    // What a forwarder on this machine cannot do, and what names of other domains are not to be asked with.
    platform::Outcome outcome = _setText("SetLinkDNSOverTLS", link, "no");
    const auto then = [&](auto next) {
        if (outcome) {
            outcome = next();
        }
    };
    then([&] { return _setText("SetLinkDNSSEC", link, "no"); });
    then([&] { return _setText("SetLinkLLMNR", link, "no"); });
    then([&] { return _setText("SetLinkMulticastDNS", link, "no"); });
    then([&] { return _keepFromBeingTheDefault(link); });
    then([&] { return _setNameserver(link, address, port); });
    then([&] { return _setDomains(link, domains); });
    return outcome;
}

platform::Outcome ResolverService::flushCaches() {
    bus::Call call(_bus.get(), kResolver, "FlushCaches");
    return send(call, "FlushCaches");
}

platform::Outcome ResolverService::reload() {
    bus::Call call(_bus.get(), kServiceManager, "ReloadUnit");
    return send(call.append("ss", "systemd-resolved.service", "replace"), "ReloadUnit");
}

} // namespace welcomer::resolver
