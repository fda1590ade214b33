#include "backends/desktop/network/NetworkManagerClient.h"

namespace welcomer::desktop {

namespace {

// Makes a context the thread's own for a scope, which is where the client library delivers to.
class ScopedContext {
  public:
    explicit ScopedContext(GMainContext* context) : _context(context) {
        g_main_context_push_thread_default(_context);
    }
    ~ScopedContext() { g_main_context_pop_thread_default(_context); }
    ScopedContext(const ScopedContext&) = delete;
    ScopedContext& operator=(const ScopedContext&) = delete;

  private:
    GMainContext* const _context;
};

// A flag that is set after a while.
class Deadline {
  public:
    Deadline(GMainContext* context, std::chrono::milliseconds limit)
        : _source(g_timeout_source_new(static_cast<guint>(limit.count()))) {
        g_source_set_callback(
            _source,
            [](gpointer hasPassed) -> gboolean {
                *static_cast<bool*>(hasPassed) = true;
                return G_SOURCE_REMOVE;
            },
            &_hasPassed, nullptr);
        g_source_attach(_source, context);
    }
    ~Deadline() {
        g_source_destroy(_source);
        g_source_unref(_source);
    }
    Deadline(const Deadline&) = delete;
    Deadline& operator=(const Deadline&) = delete;

    bool hasPassed() const { return _hasPassed; }

  private:
    GSource* const _source;
    bool _hasPassed = false;
};

} // namespace

std::unique_ptr<NetworkManagerClient> NetworkManagerClient::open(std::shared_ptr<NetworkManagerBus> bus) {
    if (!bus) {
        return nullptr;
    }
    std::unique_ptr<NetworkManagerClient> opened(
        new NetworkManagerClient(std::move(bus), ContextPointer(g_main_context_new())));
    const ScopedContext scope(opened->_context.get());
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
    const ScopedContext scope(_context.get());
    // The library has calls under way of its own; it is done with the context when this object goes.
    bool isBusy = true;
    g_object_weak_ref(
        nm_client_get_context_busy_watcher(_client.get()),
        [](gpointer busy, GObject*) { *static_cast<bool*>(busy) = false; }, &isBusy);
    _client.reset();
    while (isBusy) {
        g_main_context_iteration(_context.get(), TRUE);
    }
}

void NetworkManagerClient::refresh() {
    // After the answer to this, everything that was told before has arrived.
    static_cast<void>(_bus->property(NM_DBUS_PATH, NM_DBUS_INTERFACE, "Version"));
    const ScopedContext scope(_context.get());
    while (g_main_context_iteration(_context.get(), FALSE) != FALSE) {
    }
}

bool NetworkManagerClient::waitUntil(const std::function<bool()>& condition,
                                     std::chrono::milliseconds limit) {
    const ScopedContext scope(_context.get());
    const Deadline deadline(_context.get(), limit);
    while (!condition()) {
        if (deadline.hasPassed() || nm_client_get_nm_running(get()) == FALSE) {
            return false;
        }
        g_main_context_iteration(_context.get(), TRUE);
    }
    return true;
}

} // namespace welcomer::desktop
