// What a link has of addresses and routes, to be put back.

#pragma once

#include "backends/posix/NetlinkSocket.h"

#include <cstdint>
#include <string>
#include <vector>

namespace welcomer::local {

// A link's IPv4 addresses and its IPv4 routes, in every table and with everything that the kernel tells of
// them, and whether the link is up. One thread at a time.
class LinkSnapshot {
  public:
    //  socket  borrowed, as long as this lives
    //  wasUp   whether the link is up
    LinkSnapshot(posix::NetlinkSocket& socket, int linkIndex, bool wasUp)
        : _socket(socket),
          _linkIndex(linkIndex),
          _wasUp(wasUp) {}

    // Takes it.
    //  result  0, or the system's error number: then nothing can be restored, and nothing should be changed
    int take();

    // Has the link be again as it was: what is new goes, what is missing comes back to its place. What the
    // kernel refuses is passed over: what there is then is the best that can be had.
    void restore();

  private:
    // A message of the kernel.
    struct Entry {
        std::string payload;         // what it says, to be said again
        std::string key;             // that, but for what changes by itself: lifetimes
        std::string group;           // of a route: what tells the kernel that another one is in its place
        bool precedesOthers = false; // of a route: whether another link's of its group stands behind it
        int scope = 0;               // of a route: those that it needs have a greater one

        friend bool operator==(const Entry& one, const Entry& other) { return one.key == other.key; }
    };
    using Entries = std::vector<Entry>;

    int _readAddresses(Entries& found);
    int _readRoutes(Entries& found);
    void _restoreAddresses();
    void _restoreRoutes();
    void _send(std::uint16_t type, std::uint16_t flags, const Entry& entry);

    posix::NetlinkSocket& _socket;
    const int _linkIndex;
    const bool _wasUp;
    Entries _addresses;
    Entries _routes;
};

} // namespace welcomer::local
