// Asking the kernel through netlink.

#pragma once

#include "backends/posix/NetlinkMessages.h"

#include <functional>
#include <linux/netlink.h>
#include <memory>
#include <vector>

struct mnl_socket;

namespace welcomer::posix {

// A connection to the kernel, made when it is first used, in the network namespace of that time, by libmnl, which is
// loaded then: a program that asks nothing starts without it. One thread at a time. Results are 0 or the
// system's error number. Throws std::runtime_error where that library is not there.
class NetlinkSocket {
  public:
    using Take = std::function<void(const nlmsghdr& message)>;

    //  protocol  NETLINK_...
    explicit NetlinkSocket(int protocol = NETLINK_ROUTE) : _protocol(protocol) {}

    // Sends a request that is answered with one message or none, and waits until the kernel has dealt with
    // it.
    int ask(
        NetlinkRequest& request, const Take& take = [](const nlmsghdr&) {});

    // Sends a request for a list (NLM_F_DUMP), again and again for as long as the kernel's tables change
    // while it is told.
    //  begin  called before each attempt: what was taken before does not count
    int list(NetlinkRequest& request, const std::function<void()>& begin, const Take& take);

  private:
    struct Close {
        void operator()(mnl_socket* socket) const;
    };

    int _exchange(nlmsghdr& request, const Take& take);
    int _open();

    const int _protocol;
    std::unique_ptr<mnl_socket, Close> _socket;
    std::vector<char> _buffer;
    std::uint32_t _sequence = 0;
};

} // namespace welcomer::posix
