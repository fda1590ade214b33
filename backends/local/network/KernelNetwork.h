// The kernel's links, IPv4 addresses and default routes, read and changed through rtnetlink.

#pragma once

#include "backends/posix/NetlinkMessages.h"
#include "backends/posix/NetlinkSocket.h"

#include <optional>
#include <string>
#include <vector>

namespace welcomer::local {

// Asks the kernel anew each time, about the network namespace in which this object was first used. One thread
// at a time. What cannot be read is empty; what cannot be changed gives the system's error number.
class KernelNetwork {
  public:
    // All links, in the order of their numbers, the loopback among them.
    std::vector<posix::KernelLink> links();

    std::optional<posix::KernelLink> linkNamed(const std::string& name);
    std::optional<posix::KernelLink> linkNumbered(int index);

    // A link's IPv4 addresses, and all default routes, in the kernel's order.
    std::vector<posix::KernelAddress> addressesOf(int linkIndex);
    std::vector<posix::KernelRoute> defaultRoutes();

    // The same for whom it matters whether they could be read.
    //  result  0 or the system's error number
    int listAddresses(int linkIndex, std::vector<posix::KernelAddress>& found);
    int listDefaultRoutes(std::vector<posix::KernelRoute>& found);

    // Each gives 0 or the system's error number. Adding what is there already and removing what is not are no
    // failures.
    int setUp(int linkIndex, bool isUp);
    int addAddress(const posix::KernelAddress& address);
    int removeAddress(const posix::KernelAddress& address);
    int addDefaultRoute(const posix::KernelRoute& route); // in place of its link's one of that metric
    int removeDefaultRoute(const posix::KernelRoute& route);

    // The connection that this asks through, for what else there is to ask.
    posix::NetlinkSocket& socket() { return _socket; }

  private:
    template <class Value>
    int _list(posix::NetlinkRequest& request, std::optional<Value> (*read)(const nlmsghdr& message),
              std::vector<Value>& found);
    std::optional<posix::KernelLink> _oneLink(posix::NetlinkRequest& request);

    posix::NetlinkSocket _socket;
};

} // namespace welcomer::local
