// The kernel's links, IPv4 addresses and default routes, read and changed through rtnetlink.

#pragma once

#include "backends/posix/NetlinkMessages.h"
#include "backends/posix/NetlinkSocket.h"

#include <optional>
#include <string>
#include <vector>

namespace welcomer::posix {

// Asks the kernel anew each time, about the network namespace in which this object was first used. One thread
// at a time. What cannot be read is empty; what cannot be changed gives the system's error number.
class KernelNetwork {
  public:
    // All links, in the order of their numbers, the loopback among them.
    std::vector<KernelLink> links();

    std::optional<KernelLink> linkNamed(const std::string& name);
    std::optional<KernelLink> linkNumbered(int index);

    // A link's IPv4 addresses, and all default routes, in the kernel's order.
    std::vector<KernelAddress> addressesOf(int linkIndex);
    std::vector<KernelRoute> defaultRoutes();

    // The same for whom it matters whether they could be read.
    //  result  0 or the system's error number
    int listAddresses(int linkIndex, std::vector<KernelAddress>& found);
    int listDefaultRoutes(std::vector<KernelRoute>& found);

    // Each gives 0 or the system's error number. Adding what is there already and removing what is not are no
    // failures.
    int setUp(int linkIndex, bool isUp);
    int addAddress(const KernelAddress& address);
    int removeAddress(const KernelAddress& address);
    int addDefaultRoute(const KernelRoute& route); // in place of its link's one of that metric
    int removeDefaultRoute(const KernelRoute& route);

    // The connection that this asks through, for what else there is to ask.
    NetlinkSocket& socket() { return _socket; }

  private:
    template <class Value>
    int _list(NetlinkRequest& request, std::optional<Value> (*read)(const nlmsghdr& message),
              std::vector<Value>& found);
    std::optional<KernelLink> _oneLink(NetlinkRequest& request);

    NetlinkSocket _socket;
};

} // namespace welcomer::posix
