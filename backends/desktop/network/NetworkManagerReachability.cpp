#include "backends/desktop/network/NetworkManagerReachability.h"

#include "backends/desktop/network/NetworkManagerBus.h"

#include <nm-dbus-interface.h>

#include <utility>

namespace welcomer::desktop {

namespace {

// Looking takes NetworkManager up to twenty seconds.
constexpr std::chrono::milliseconds kCheckLimit{30'000};

bool isBehindPortal() {
    const auto bus = NetworkManagerBus::open();
    if (!bus) {
        return false;
    }
    const NetworkManagerReply checked =
        bus->call(NM_DBUS_PATH, NM_DBUS_INTERFACE, "CheckConnectivity", nullptr, kCheckLimit);
    // Those who may not have it look are told what it found last.
    const VariantPointer found = checked ? VariantPointer(g_variant_get_child_value(checked.value.get(), 0))
                                         : bus->property(NM_DBUS_PATH, NM_DBUS_INTERFACE, "Connectivity");
    return found && g_variant_is_of_type(found.get(), G_VARIANT_TYPE_UINT32) &&
           g_variant_get_uint32(found.get()) == NM_CONNECTIVITY_PORTAL;
}

class Target final : public platform::HostReachabilityTarget {
  public:
    explicit Target(std::unique_ptr<platform::HostReachabilityTarget> kernel) : _kernel(std::move(kernel)) {}

    std::optional<std::uint32_t> flags() override {
        std::optional<std::uint32_t> flags = _kernel->flags();
        if (flags && (*flags & platform::kHostReachable) != 0 && isBehindPortal()) {
            *flags |= platform::kHostConnectionRequired;
        }
        return flags;
    }

  private:
    const std::unique_ptr<platform::HostReachabilityTarget> _kernel;
};

} // namespace

std::unique_ptr<platform::HostReachabilityTarget>
NetworkManagerReachability::createTarget(const std::string& hostName) {
    return std::make_unique<Target>(_kernel.createTarget(hostName));
}

} // namespace welcomer::desktop
