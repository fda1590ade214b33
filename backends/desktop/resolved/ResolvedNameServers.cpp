#include "backends/desktop/resolved/ResolvedNameServers.h"

#include "backends/bus/BusCall.h"
#include "platform/NetworkConfigStore.h"

#include <algorithm>
#include <arpa/inet.h>
#include <cerrno>
#include <chrono>
#include <net/if.h>
#include <systemd/sd-bus.h>
#include <thread>

namespace welcomer::desktop {

namespace {

using Clock = std::chrono::steady_clock;

constexpr bus::Peer kResolver = {"org.freedesktop.resolve1", "/org/freedesktop/resolve1",
                                 "org.freedesktop.resolve1.Manager", std::chrono::seconds(10)};
constexpr std::chrono::milliseconds kNextAttempt{10};

// Adds an address, which was checked, as its family and its bytes. A zone goes: it is the link's.
void append(bus::Call& call, const std::string& server) {
    in6_addr bytes = {};
    const std::string address = server.substr(0, server.find('%'));
    const int family = address.find(':') == std::string::npos ? AF_INET : AF_INET6;
    ::inet_pton(family, address.c_str(), &bytes);
    const std::size_t size = family == AF_INET ? sizeof(in_addr) : sizeof bytes;
    call.open('r', "iay").append("i", family).appendBytes(&bytes, size).close();
}

//  end  when the answer has to be there
bus::Call setLinkDNS(sd_bus* bus, Clock::time_point end, int link, const std::vector<std::string>& servers) {
    bus::Call call(bus, kResolver.within(end - Clock::now()), "SetLinkDNS");
    call.append("i", link).open('a', "(iay)");
    for (const std::string& server : servers) {
        append(call, server);
    }
    call.close();
    return call;
}

// What a failed call means.
std::int32_t statusOf(const bus::Call& call, const platform::Error& error) {
    if (error.number == ETIMEDOUT || call.hasFailedWith(SD_BUS_ERROR_NO_REPLY)) {
        return platform::kNetworkConfigNameServiceSilent;
    }
    const bool isAbsent = call.hasFailedWith(SD_BUS_ERROR_SERVICE_UNKNOWN) ||
                          call.hasFailedWith(SD_BUS_ERROR_NAME_HAS_NO_OWNER);
    return isAbsent ? platform::kNetworkConfigNameServersElsewhere
                    : platform::kNetworkConfigNameServersNotWritten;
}

} // namespace

std::int32_t ResolvedNameServers::setServers(const std::string& device,
                                             const std::vector<std::string>& servers, std::string& detail) {
    const auto link = static_cast<int>(::if_nametoindex(device.c_str()));
    if (link == 0) {
        detail = device;
        return platform::kNetworkConfigNoDevice;
    }
    const Clock::time_point end = Clock::now() + kResolver.limit;
    platform::Error why;
    const bus::Bus bus = bus::openSystemBus(kResolver.limit, &why);
    if (!bus) {
        const bool isSilent = why.number == ETIMEDOUT;
        detail = (isSilent ? "systemd-resolved: " : "systemd-resolved: no system bus: ") + why.message;
        return isSilent ? platform::kNetworkConfigNameServiceSilent
                        : platform::kNetworkConfigNameServersElsewhere;
    }
    for (;;) {
        bus::Call call = setLinkDNS(bus.get(), end, link, servers);
        const platform::Outcome sent = call.send();
        if (sent) {
            return platform::kNetworkConfigSuccess;
        }
        if (!call.hasFailedWith("org.freedesktop.resolve1.NoSuchLink")) {
            detail = "systemd-resolved: " + sent.error.message;
            return statusOf(call, sent.error);
        }
        // A link that was made only now it may not have heard of.
        std::this_thread::sleep_for(kNextAttempt);
    }
}

bool isResolvedRunning(std::string& whyNot) {
    platform::Error why;
    const bus::Bus bus = bus::openSystemBus(kResolver.limit, &why);
    if (bus && bus::isRunning(bus.get(), kResolver, &why)) {
        return true;
    }
    whyNot = why.number == 0 ? "it does not run" : "the system bus: " + why.message;
    return false;
}

} // namespace welcomer::desktop
