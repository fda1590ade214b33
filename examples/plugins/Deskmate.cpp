// A companion on the desktop, whose delegate does all of its work on GLib's main context: a timer while the
// agent waits for it, and a call on the session bus while the agent lingers. It needs the desktop's run loop,
// which iterates that context on the main thread.

#include <welcomer/DelegatePlugin.hpp>

#include <gio/gio.h>
#include <memory>
#include <string>

namespace sdk = welcomer::sdk;

namespace {

void greeted(GObject* connection, GAsyncResult* result, gpointer /*data*/) {
    // A desktop that shows no notifications is not greeted.
    if (GVariant* const answer =
            g_dbus_connection_call_finish(G_DBUS_CONNECTION(connection), result, nullptr)) {
        g_variant_unref(answer);
    }
}

void greet(GObject* /*source*/, GAsyncResult* result, gpointer /*data*/) {
    GDBusConnection* const connection = g_bus_get_finish(result, nullptr);
    if (!connection) {
        return;
    }
    // When the bus dies, GLib would end the whole process, the other delegates with it.
    g_dbus_connection_set_exit_on_close(connection, FALSE);
    g_dbus_connection_call(
        connection, "org.freedesktop.Notifications", "/org/freedesktop/Notifications",
        "org.freedesktop.Notifications", "Notify",
        g_variant_new("(susssasa{sv}i)", "Deskmate", 0U, "", "Deskmate is ready", "", nullptr, nullptr, -1),
        nullptr, G_DBUS_CALL_FLAGS_NONE, -1, nullptr, greeted, nullptr);
    g_object_unref(connection);
}

// On the main thread, as everything is that GLib calls here.
gboolean complete(gpointer data) {
    const std::unique_ptr<sdk::CompletionHandler> handler(static_cast<sdk::CompletionHandler*>(data));
    (*handler)(true);
    // What comes after the setup's end has the time that the agent lingers.
    g_bus_get(G_BUS_TYPE_SESSION, nullptr, greet, nullptr);
    return G_SOURCE_REMOVE;
}

class Deskmate : public sdk::WLFirstRunDelegateConfiguration {
  public:
    std::optional<std::string> delegateIdentifier() override { return "com.corvid.deskmate"; }

    std::optional<sdk::Value> delegateSetupRequest() override {
        sdk::Value request = sdk::Value::dictionary();
        request.set("protocolVersion", 1);
        return request;
    }

    // On a queue of the host's: the context takes sources from any thread.
    void completeSetupWithResponseHandler(sdk::ValueView response, sdk::CompletionHandler handler) override {
        const auto seconds = response.find("delaySeconds").integer().value_or(0);
        g_timeout_add_seconds(seconds > 0 && seconds < 3600 ? static_cast<guint>(seconds) : 0, complete,
                              new sdk::CompletionHandler(handler));
    }
};

} // namespace

WL_EXPORT_DELEGATE_PLUGIN(Deskmate)
