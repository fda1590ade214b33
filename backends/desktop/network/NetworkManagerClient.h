// What NetworkManager has, seen through its client library, on a main context of its own.

#pragma once

#include "backends/desktop/glib/MainContext.h"
#include "backends/desktop/network/NetworkManagerBus.h"

#include <NetworkManager.h>

#include <chrono>
#include <functional>
#include <memory>
#include <utility>

namespace welcomer::desktop {

// The client's objects change only while this object's functions run. One thread at a time.
class NetworkManagerClient {
  public:
    // Fetches everything that NetworkManager has.
    //  result  null when it is not running
    static std::unique_ptr<NetworkManagerClient> open(std::shared_ptr<NetworkManagerBus> bus);

    ~NetworkManagerClient();
    NetworkManagerClient(const NetworkManagerClient&) = delete;
    NetworkManagerClient& operator=(const NetworkManagerClient&) = delete;

    // Borrowed.
    NMClient* get() const { return _client.get(); }
    const NetworkManagerBus& bus() const { return *_bus; }

    // Takes in what NetworkManager has told since.
    void refresh();

    // Takes in what it tells until a condition holds.
    //  result  false when it does not within the limit, or NetworkManager went away
    bool waitUntil(const std::function<bool()>& condition, std::chrono::milliseconds limit);

  private:
    explicit NetworkManagerClient(std::shared_ptr<NetworkManagerBus> bus) : _bus(std::move(bus)) {}

    const std::shared_ptr<NetworkManagerBus> _bus;
    MainContext _context;
    ObjectPointer<NMClient> _client;
};

} // namespace welcomer::desktop
