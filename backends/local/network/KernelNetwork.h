// The kernel's links, IPv4 addresses and default routes, read and changed through rtnetlink.

#pragma once

#include "backends/posix/FileDescriptor.h"
#include "backends/posix/NetlinkMessages.h"

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

    // A link's IPv4 addresses and default routes, in the kernel's order.
    std::vector<posix::KernelAddress> addressesOf(int linkIndex);
    std::vector<posix::KernelRoute> defaultRoutes();

    // Each gives 0 or the system's error number. Adding what is there already and removing what is not are no
    // failures.
    int bringUp(int linkIndex);
    int addAddress(const posix::KernelAddress& address);
    int removeAddress(const posix::KernelAddress& address);
    int addDefaultRoute(const posix::KernelRoute& route);
    int removeDefaultRoute(const posix::KernelRoute& route);

  private:
    // Sends a request and shows the payloads of its answers.
    //  result  0 or the system's error number
    int _ask(posix::NetlinkRequest& request, const std::function<void(std::string_view payload)>& take);
    // The same, again and again for as long as the kernel's tables change under a listing.
    int _list(posix::NetlinkRequest& request, const std::function<void()>& begin,
              const std::function<void(std::string_view payload)>& take);
    int _change(posix::NetlinkRequest& request);
    int _open();
    std::optional<posix::KernelLink> _oneLink(posix::NetlinkRequest& request);

    posix::FileDescriptor _socket;
    std::string _buffer;
    std::uint32_t _sequence = 0;
};

} // namespace welcomer::local
