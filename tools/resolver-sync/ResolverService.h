// systemd-resolved, as its clients on the system bus see it.

#pragma once

#include "backends/bus/BusCall.h"
#include "platform/Error.h"

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

struct sd_event;

namespace welcomer::resolver {

class ResolverService {
  public:
    // Throws std::system_error when there is no system bus.
    //  event     where its signals arrive; borrowed
    //  appeared  called whenever the service has started, and when the bus has been lost with false
    ResolverService(sd_event* event, std::function<void(bool running)> appeared);
    ~ResolverService();
    ResolverService(const ResolverService&) = delete;
    ResolverService& operator=(const ResolverService&) = delete;

    // Whether it runs. Starts nothing.
    bool isRunning();

    // Whether it reads delegate files: it tells of delegates then.
    bool hasDelegates();

    // Has the queries for these domains, and no others, go to one nameserver on a link.
    platform::Outcome routeLink(int link, const std::vector<std::string>& domains, const std::string& address,
                                std::uint16_t port);

    // Forgets what it knows from the nameservers before.
    platform::Outcome flushCaches();

    // Has it read its files again, by way of the service manager.
    platform::Outcome reload();

  private:
    // Gives a link's setting this text.
    platform::Outcome _setText(const char* method, int link, const char* text);
    platform::Outcome _keepFromBeingTheDefault(int link);
    platform::Outcome _setNameserver(int link, const std::string& address, std::uint16_t port);
    platform::Outcome _setDomains(int link, const std::vector<std::string>& domains);

    bus::Bus _bus;
    std::function<void(bool)> _appeared;
};

} // namespace welcomer::resolver
