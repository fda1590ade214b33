#include "backends/desktop/resolved/ResolvedNameServers.h"

#include "platform/NetworkConfigStore.h"

#include <algorithm>
#include <arpa/inet.h>
#include <cerrno>
#include <chrono>
#include <memory>
#include <net/if.h>
#include <system_error>
#include <systemd/sd-bus.h>
#include <thread>

namespace welcomer::desktop {

namespace {

using Clock = std::chrono::steady_clock;

constexpr char kService[] = "org.freedesktop.resolve1";
constexpr std::chrono::seconds kPatience{10};
constexpr std::chrono::milliseconds kNextAttempt{10};

struct CloseBus {
    void operator()(sd_bus* bus) const { sd_bus_close_unref(bus); }
};
struct DropMessage {
    void operator()(sd_bus_message* message) const { sd_bus_message_unref(message); }
};
using Message = std::unique_ptr<sd_bus_message, DropMessage>;

// A conversation on the system bus that ends in time. Results are 0 or more, or a negative error number.
class Conversation {
  public:
    Conversation() = default;
    ~Conversation() { sd_bus_error_free(&_error); }
    Conversation(const Conversation&) = delete;
    Conversation& operator=(const Conversation&) = delete;

    // Waits until the bus has let us in: a call would wait for that without a limit.
    int open() {
        sd_bus* opened = nullptr;
        int result = sd_bus_open_system(&opened);
        _bus.reset(opened);
        while (result >= 0 && (result = sd_bus_is_ready(opened)) == 0) {
            result = sd_bus_process(opened, nullptr);
            if (result == 0) {
                result = _left() == 0 ? -ETIMEDOUT : sd_bus_wait(opened, _left());
            }
        }
        return result;
    }

    Message newCall(const char* service, const char* path, const char* interface, const char* method) {
        sd_bus_message* made = nullptr;
        sd_bus_message_new_method_call(_bus.get(), &made, service, path, interface, method);
        if (made) {
            // Whoever does not run the service resolves names in another way, and is to go on doing so.
            sd_bus_message_set_auto_start(made, 0);
        }
        return Message(made);
    }

    int call(sd_bus_message* message, sd_bus_message** answer = nullptr) {
        sd_bus_error_free(&_error);
        return _left() == 0 ? -ETIMEDOUT : sd_bus_call(_bus.get(), message, _left(), &_error, answer);
    }

    bool hasFailedWith(const char* name) const { return sd_bus_error_has_name(&_error, name) != 0; }

    // What the last call said about its failure.
    std::string reason(int result) const {
        return _error.message ? _error.message : std::generic_category().message(-result);
    }

  private:
    // Microseconds; none is left at 0.
    std::uint64_t _left() const {
        const auto left = std::chrono::duration_cast<std::chrono::microseconds>(_end - Clock::now()).count();
        return left > 0 ? static_cast<std::uint64_t>(left) : 0;
    }

    const Clock::time_point _end = Clock::now() + kPatience;
    std::unique_ptr<sd_bus, CloseBus> _bus;
    sd_bus_error _error{};
};

// Adds an address, which was checked, as its family and its bytes. A zone goes: it is the link's.
int append(sd_bus_message* message, const std::string& server) {
    in6_addr bytes = {};
    const std::string address = server.substr(0, server.find('%'));
    const int family = address.find(':') == std::string::npos ? AF_INET : AF_INET6;
    ::inet_pton(family, address.c_str(), &bytes);
    int result = sd_bus_message_open_container(message, 'r', "iay");
    result = result < 0 ? result : sd_bus_message_append(message, "i", family);
    const std::size_t size = family == AF_INET ? sizeof(in_addr) : sizeof bytes;
    result = result < 0 ? result : sd_bus_message_append_array(message, 'y', &bytes, size);
    return result < 0 ? result : sd_bus_message_close_container(message);
}

int setLinkDNS(Conversation& conversation, int link, const std::vector<std::string>& servers) {
    const Message message = conversation.newCall(kService, "/org/freedesktop/resolve1",
                                                 "org.freedesktop.resolve1.Manager", "SetLinkDNS");
    int result = message ? sd_bus_message_append(message.get(), "i", link) : -ENOMEM;
    result = result < 0 ? result : sd_bus_message_open_container(message.get(), 'a', "(iay)");
    for (const std::string& server : servers) {
        result = result < 0 ? result : append(message.get(), server);
    }
    result = result < 0 ? result : sd_bus_message_close_container(message.get());
    return result < 0 ? result : conversation.call(message.get());
}

} // namespace

std::int32_t ResolvedNameServers::setServers(const std::string& device,
                                             const std::vector<std::string>& servers, std::string& detail) {
    const auto link = static_cast<int>(::if_nametoindex(device.c_str()));
    if (link == 0) {
        detail = device;
        return platform::kNetworkConfigNoDevice;
    }
    Conversation conversation;
    int result = conversation.open();
    if (result < 0 && result != -ETIMEDOUT) {
        detail = "systemd-resolved: no system bus: " + conversation.reason(result);
        return platform::kNetworkConfigNameServersElsewhere;
    }
    while (result >= 0 && (result = setLinkDNS(conversation, link, servers)) < 0 &&
           conversation.hasFailedWith("org.freedesktop.resolve1.NoSuchLink")) {
        // A link that was made only now it may not have heard of.
        std::this_thread::sleep_for(kNextAttempt);
        result = 0;
    }
    if (result >= 0) {
        return platform::kNetworkConfigSuccess;
    }
    detail = "systemd-resolved: " + conversation.reason(result);
    if (result == -ETIMEDOUT || conversation.hasFailedWith(SD_BUS_ERROR_NO_REPLY)) {
        return platform::kNetworkConfigNameServiceSilent;
    }
    const bool isAbsent = conversation.hasFailedWith(SD_BUS_ERROR_SERVICE_UNKNOWN) ||
                          conversation.hasFailedWith(SD_BUS_ERROR_NAME_HAS_NO_OWNER);
    return isAbsent ? platform::kNetworkConfigNameServersElsewhere
                    : platform::kNetworkConfigNameServersNotWritten;
}

bool isResolvedRunning(std::string& whyNot) {
    Conversation conversation;
    int isOwned = 0;
    int result = conversation.open();
    if (result >= 0) {
        const Message message = conversation.newCall("org.freedesktop.DBus", "/org/freedesktop/DBus",
                                                     "org.freedesktop.DBus", "NameHasOwner");
        sd_bus_message* answer = nullptr;
        result = message ? sd_bus_message_append(message.get(), "s", kService) : -ENOMEM;
        result = result < 0 ? result : conversation.call(message.get(), &answer);
        const Message held(answer);
        result = result < 0 ? result : sd_bus_message_read(answer, "b", &isOwned);
    }
    if (result < 0 || isOwned == 0) {
        whyNot = result < 0 ? "the system bus: " + conversation.reason(result) : "it does not run";
    }
    return result >= 0 && isOwned != 0;
}

} // namespace welcomer::desktop
