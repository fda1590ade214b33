#include "backends/local/network/LocalHostReachability.h"

#include "backends/posix/FileDescriptor.h"

#include <netdb.h>
#include <sys/socket.h>
#include <utility>

namespace welcomer::local {

namespace {

// Any port does: connecting a datagram socket looks up the route and sends nothing.
constexpr char kPort[] = "443";

bool hasRoute(const addrinfo& address) {
    const posix::FileDescriptor socket(::socket(address.ai_family, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    return socket && ::connect(socket.get(), address.ai_addr, address.ai_addrlen) == 0;
}

class LocalHostReachabilityTarget final : public platform::HostReachabilityTarget {
  public:
    explicit LocalHostReachabilityTarget(std::string hostName) : _hostName(std::move(hostName)) {}

    std::optional<std::uint32_t> flags() override {
        addrinfo hints = {};
        hints.ai_socktype = SOCK_DGRAM;
        addrinfo* found = nullptr;
        const int error = ::getaddrinfo(_hostName.c_str(), kPort, &hints, &found);
        if (error == EAI_SYSTEM || error == EAI_MEMORY) {
            return std::nullopt;
        }
        if (error != 0) {
            return 0U;
        }
        const std::unique_ptr<addrinfo, void (*)(addrinfo*)> addresses(found, ::freeaddrinfo);
        for (const addrinfo* address = addresses.get(); address; address = address->ai_next) {
            if (hasRoute(*address)) {
                return platform::kHostReachable;
            }
        }
        return 0U;
    }

  private:
    const std::string _hostName;
};

} // namespace

std::unique_ptr<platform::HostReachabilityTarget>
LocalHostReachability::createTarget(const std::string& hostName) {
    return std::make_unique<LocalHostReachabilityTarget>(hostName);
}

} // namespace welcomer::local
