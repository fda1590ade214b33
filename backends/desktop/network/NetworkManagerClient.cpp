#include "backends/desktop/network/NetworkManagerClient.h"

namespace welcomer::desktop {

std::unique_ptr<NetworkManagerClient> NetworkManagerClient::open(std::shared_ptr<NetworkManagerBus> bus) {
    if (!bus) {
        return nullptr;
    }
    std::unique_ptr<NetworkManagerClient> opened(new NetworkManagerClient(std::move(bus)));
    const MainContext::Scope scope(opened->_context);
    // Permissions are asked for when something is refused, not before.
    opened->_client.reset(static_cast<NMClient*>(
        g_initable_new(NM_TYPE_CLIENT, nullptr, nullptr, NM_CLIENT_DBUS_CONNECTION,
                       opened->bus().connection(), NM_CLIENT_INSTANCE_FLAGS,
                       static_cast<guint>(NM_CLIENT_INSTANCE_FLAGS_NO_AUTO_FETCH_PERMISSIONS), nullptr)));
    if (!opened->_client || !nm_client_get_nm_running(opened->get())) {
        return nullptr;
    }
    return opened;
}

NetworkManagerClient::~NetworkManagerClient() {
    if (!_client) {
        return;
    }
    const MainContext::Scope scope(_context);
    // The library has calls under way of its own; it is done with the context when this object goes.
    bool isBusy = true;
    g_object_weak_ref(
        nm_client_get_context_busy_watcher(_client.get()),
        [](gpointer busy, GObject*) { *static_cast<bool*>(busy) = false; }, &isBusy);
    _client.reset();
    _context.waitUntil([&isBusy] { return !isBusy; });
}

void NetworkManagerClient::refresh() {
    // After the answer to this, everything that was told before has arrived.
    static_cast<void>(_bus->property(NM_DBUS_PATH, NM_DBUS_INTERFACE, "Version"));
    const MainContext::Scope scope(_context);
    _context.deliver();
}

bool NetworkManagerClient::waitUntil(const std::function<bool()>& condition,
                                     std::chrono::milliseconds limit) {
    const MainContext::Scope scope(_context);
    bool holds = false;
    _context.waitUntil(
        [&] {
            holds = condition();
            return holds || nm_client_get_nm_running(get()) == FALSE;
        },
        Deadline(limit));
    return holds;
}

} // namespace welcomer::desktop
