#include "tools/resolver-sync/OwnLink.h"

#include <arpa/inet.h>
#include <cerrno>
#include <cstring>
#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <linux/veth.h>
#include <net/if.h>
#include <string>
#include <string_view>
#include <sys/socket.h>
#include <system_error>
#include <unistd.h>

namespace welcomer::resolver {

namespace {

constexpr const char* kName = "welcomer0";
constexpr const char* kPeerName = "welcomer1";
// The address that is reserved as a dummy: nothing sends to it, and no network has it.
constexpr const char* kAddress = "192.0.0.8";

// One request to the kernel, put together part by part.
class LinkRequest {
  public:
    LinkRequest(std::uint16_t type, std::uint16_t flags) {
        const nlmsghdr header{0, type, static_cast<std::uint16_t>(NLM_F_REQUEST | NLM_F_ACK | flags), 1, 0};
        _append(&header, sizeof header);
    }

    template <class Part>
    void add(const Part& part) {
        _append(&part, sizeof part);
    }

    void attribute(std::uint16_t type, const void* data, std::size_t size) {
        const std::size_t begin = open(type);
        _append(data, size);
        close(begin);
    }
    void attribute(std::uint16_t type, const char* text) { attribute(type, text, std::strlen(text) + 1); }

    // An attribute that holds others, from `open` to `close`.
    std::size_t open(std::uint16_t type) {
        const std::size_t begin = _bytes.size();
        const rtattr head{0, type};
        _append(&head, sizeof head);
        return begin;
    }
    void close(std::size_t begin) {
        const auto size = static_cast<unsigned short>(_bytes.size() - begin);
        std::memcpy(_bytes.data() + begin, &size, sizeof size);
    }

    // Sends it and takes the kernel's answer: 0, or an error number.
    int send() {
        const auto size = static_cast<std::uint32_t>(_bytes.size());
        std::memcpy(_bytes.data(), &size, sizeof size);
        const int socket = ::socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_ROUTE);
        if (socket < 0) {
            return errno;
        }
        const int number = _exchange(socket);
        ::close(socket);
        return number;
    }

  private:
    int _exchange(int socket) const {
        sockaddr_nl kernel{};
        kernel.nl_family = AF_NETLINK;
        if (::sendto(socket, _bytes.data(), _bytes.size(), 0, reinterpret_cast<const sockaddr*>(&kernel),
                     sizeof kernel) < 0) {
            return errno;
        }
        alignas(nlmsghdr) char answer[8192];
        const ssize_t count = ::recv(socket, answer, sizeof answer, 0);
        if (count < 0) {
            return errno;
        }
        const auto* const header = reinterpret_cast<const nlmsghdr*>(answer);
        if (static_cast<std::size_t>(count) < NLMSG_LENGTH(sizeof(nlmsgerr)) ||
            header->nlmsg_type != NLMSG_ERROR) {
            return EPROTO;
        }
        return -static_cast<const nlmsgerr*>(NLMSG_DATA(header))->error;
    }

    void _append(const void* data, std::size_t size) {
        _bytes.append(static_cast<const char*>(data), size);
        _bytes.resize(NLMSG_ALIGN(_bytes.size())); // every part begins at a multiple of four
    }

    std::string _bytes;
};

int makePair() {
    LinkRequest request(RTM_NEWLINK, NLM_F_CREATE | NLM_F_EXCL);
    request.add(ifinfomsg{});
    request.attribute(IFLA_IFNAME, kName);
    const std::size_t information = request.open(IFLA_LINKINFO);
    request.attribute(IFLA_INFO_KIND, "veth");
    const std::size_t data = request.open(IFLA_INFO_DATA);
    const std::size_t peer = request.open(VETH_INFO_PEER);
    request.add(ifinfomsg{});
    request.attribute(IFLA_IFNAME, kPeerName);
    request.close(peer);
    request.close(data);
    request.close(information);
    return request.send();
}

// Neither end can be up before both are there.
int bringUp(const char* name) {
    ifinfomsg link{};
    link.ifi_index = static_cast<int>(::if_nametoindex(name));
    link.ifi_flags = IFF_UP;
    link.ifi_change = IFF_UP;
    LinkRequest request(RTM_NEWLINK, 0);
    request.add(link);
    return request.send();
}

int addAddress(int index) {
    in_addr address{};
    ::inet_pton(AF_INET, kAddress, &address);
    ifaddrmsg message{};
    message.ifa_family = AF_INET;
    message.ifa_prefixlen = 32;
    message.ifa_scope = RT_SCOPE_UNIVERSE;
    message.ifa_index = static_cast<unsigned>(index);
    LinkRequest request(RTM_NEWADDR, NLM_F_CREATE | NLM_F_REPLACE);
    request.add(message);
    request.attribute(IFA_LOCAL, &address, sizeof address);
    request.attribute(IFA_ADDRESS, &address, sizeof address);
    return request.send();
}

platform::Outcome outcome(int number, const std::string& what) {
    if (number == 0) {
        return platform::Outcome::success();
    }
    return platform::Outcome::failure({number, what + ": " + std::generic_category().message(number)});
}

} // namespace

int OwnLink::index() {
    return static_cast<int>(::if_nametoindex(kName));
}

platform::Outcome OwnLink::make() {
    if (index() != 0) {
        return platform::Outcome::success();
    }
    int number = makePair();
    if (number != 0) {
        return outcome(number, std::string("failed to create the link ") + kName);
    }
    number = addAddress(index());
    for (const char* const end : {kPeerName, kName}) {
        number = number != 0 ? number : bringUp(end);
    }
    if (number != 0) {
        // Half a link would pass for a whole one the next time.
        static_cast<void>(remove());
    }
    return outcome(number, std::string("failed to bring up the link ") + kName);
}

platform::Outcome OwnLink::remove() {
    const int number = index();
    if (number == 0) {
        return platform::Outcome::success();
    }
    ifinfomsg link{};
    link.ifi_family = AF_UNSPEC;
    link.ifi_index = number;
    LinkRequest request(RTM_DELLINK, 0);
    request.add(link);
    return outcome(request.send(), std::string("failed to remove the link ") + kName);
}

} // namespace welcomer::resolver
