// The nameserver on a loopback address that hands each domain's queries to the domain's own nameserver.

#pragma once

#include "platform/Error.h"
#include "tools/resolver-sync/Overrides.h"

#include <cstdint>
#include <string>
#include <sys/types.h>

namespace welcomer::resolver {

// The lines that tell dnsmasq which nameserver answers for which domain.
std::string serverLines(const Overrides& overrides);

// A dnsmasq of our own, which asks nobody about anything else and keeps nothing.
class Forwarder {
  public:
    // No other user can listen there: the port is one for the superuser, and for whom the machine's owner trusts. Those
    // from 512 on are what other services take any of.
    static constexpr const char* kAddress = "127.0.77.1";
    static constexpr std::uint16_t kPort = 335;

    //  folder  where its one file lies; made when it is needed and removed at the end
    explicit Forwarder(std::string folder);
    ~Forwarder();
    Forwarder(const Forwarder&) = delete;
    Forwarder& operator=(const Forwarder&) = delete;

    // Starts it, or tells the running one what has changed. Does not wait for its start.
    platform::Outcome serve(const Overrides& overrides);

    // Waits until it answers, for some seconds at most. What somebody else answers in its place does not count.
    platform::Outcome waitUntilReady();

    // Ends it and removes its folder.
    void stop();

    // Its process, or 0.
    pid_t process() const { return _process; }

    // The process has ended by itself and has been waited for.
    void hasEnded() { _process = 0; }

  private:
    platform::Outcome _writeServers(const Overrides& overrides) const;
    platform::Outcome _start();

    std::string _folder;
    std::string _serversFile;
    std::string _secret; // what it alone answers
    pid_t _process = 0;
};

} // namespace welcomer::resolver
