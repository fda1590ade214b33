// Who is at the other end of a connection.

#pragma once

#include "tools/account-server/Http.h"
#include "tools/account-server/Settings.h"

#include <optional>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <vector>

namespace welcomer::server {

// The peer that an address in text form stands for, or none when it is no address. What failed from one
// network of IPv6 counts together: whoever has an address there has all of them. Any thread.
std::optional<Peer> peerAt(std::string_view address);

// Any thread.
class PeerOf {
  public:
    // Looks the users up that the settings name. Throws std::runtime_error with one line when there is none
    // of that name.
    explicit PeerOf(const Settings& settings);

    struct Connected {
        Peer peer;
        bool isFront = false;   // its word is taken for where a request comes from
        bool isAllowed = false; // it may ask at all
    };
    Connected connected(int socket) const;

    // Who sends a request on a connection.
    //  forwardedFor  the head's fields of that name, or nothing
    static Peer sender(const Connected& connected, std::string_view forwardedFor);

  private:
    // Who comes over the network, or from this machine by its loopback address.
    Connected _connectedFrom(Peer peer, bool isLocal) const;

    std::vector<uid_t> _fronts;
    std::vector<std::string> _frontAddresses;
    std::vector<uid_t> _users; // empty: everybody
    bool _trustsLoopback;
};

} // namespace welcomer::server
