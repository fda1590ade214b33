#include "backends/desktop/network/NetworkManagerConfigStore.h"

#include "backends/desktop/network/NetworkManagerActivation.h"
#include "backends/desktop/network/NetworkManagerServices.h"

#include <utility>

namespace welcomer::desktop {

namespace {

// Services are profiles, and devices use them.
class Profiles final : public network::Backing {
  public:
    Profiles(std::unique_ptr<NetworkManagerClient> client, platform::NetworkConfigStore& kernel)
        : _client(std::move(client)),
          _kernel(kernel) {}

    std::optional<std::vector<network::StoredService>> load() override {
        _client->refresh();
        return readServices(*_client, _kernel.copyInterfaces());
    }

    network::Outcome store(std::vector<network::ChangedService>& changed) override {
        return storeServices(_client->bus(), changed);
    }

    network::Outcome apply(const network::StoredService& service,
                           const network::IPv4Configuration& configuration) override {
        return activateService(*_client, service, configuration);
    }

  private:
    const std::unique_ptr<NetworkManagerClient> _client;
    platform::NetworkConfigStore& _kernel;
};

} // namespace

std::shared_ptr<platform::NetworkConfigConnection> NetworkManagerConfigStore::open(const std::string& name) {
    auto connection =
        network::openStoredConfiguration([&kernel = _kernel]() -> std::unique_ptr<network::Backing> {
            auto client = NetworkManagerClient::open(NetworkManagerBus::open());
            return client ? std::make_unique<Profiles>(std::move(client), kernel) : nullptr;
        });
    return connection ? connection : _kernel.open(name);
}

std::vector<std::shared_ptr<platform::NetworkInterface>> NetworkManagerConfigStore::copyInterfaces() {
    return _kernel.copyInterfaces();
}

} // namespace welcomer::desktop
