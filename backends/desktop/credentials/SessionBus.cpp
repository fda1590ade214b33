#include "backends/desktop/credentials/SessionBus.h"

#include "platform/CredentialStore.h"

#include <libsecret/secret.h>

namespace welcomer::desktop {

namespace {

using Status = std::int32_t;

Status statusOfBusError(int code) {
    switch (code) {
    case G_DBUS_ERROR_SERVICE_UNKNOWN:
    case G_DBUS_ERROR_NAME_HAS_NO_OWNER:
    case G_DBUS_ERROR_TIMED_OUT: // of an activation
    case G_DBUS_ERROR_TIMEOUT:
    case G_DBUS_ERROR_SPAWN_EXEC_FAILED:
    case G_DBUS_ERROR_SPAWN_FORK_FAILED:
    case G_DBUS_ERROR_SPAWN_CHILD_EXITED:
    case G_DBUS_ERROR_SPAWN_CHILD_SIGNALED:
    case G_DBUS_ERROR_SPAWN_FAILED:
    case G_DBUS_ERROR_SPAWN_SETUP_FAILED:
    case G_DBUS_ERROR_SPAWN_CONFIG_INVALID:
    case G_DBUS_ERROR_SPAWN_SERVICE_INVALID:
    case G_DBUS_ERROR_SPAWN_SERVICE_NOT_FOUND:
    case G_DBUS_ERROR_SPAWN_PERMISSIONS_INVALID:
    case G_DBUS_ERROR_SPAWN_FILE_INVALID:
    case G_DBUS_ERROR_SPAWN_NO_MEMORY:
        return platform::kCredentialNoService;
    case G_DBUS_ERROR_NO_SERVER:
    case G_DBUS_ERROR_DISCONNECTED:
    case G_DBUS_ERROR_NO_NETWORK:
        return platform::kCredentialNoBus;
    case G_DBUS_ERROR_UNKNOWN_OBJECT: // the item is gone
    case G_DBUS_ERROR_UNKNOWN_INTERFACE:
    case G_DBUS_ERROR_UNKNOWN_METHOD:
        return platform::kCredentialItemNotFound;
    default:
        return platform::kCredentialServiceFailed;
    }
}

} // namespace

Status statusOf(const GError* error) {
    if (!error) {
        return platform::kCredentialServiceFailed;
    }
    if (error->domain == G_DBUS_ERROR) {
        return statusOfBusError(error->code);
    }
    if (error->domain == SECRET_ERROR) {
        if (error->code == SECRET_ERROR_IS_LOCKED) {
            return platform::kCredentialLocked;
        }
        return error->code == SECRET_ERROR_NO_SUCH_OBJECT ? platform::kCredentialItemNotFound
                                                          : platform::kCredentialServiceFailed;
    }
    if (error->domain == G_IO_ERROR) {
        if (error->code == G_IO_ERROR_CLOSED || error->code == G_IO_ERROR_BROKEN_PIPE ||
            error->code == G_IO_ERROR_CONNECTION_CLOSED) {
            return platform::kCredentialNoBus;
        }
        if (error->code == G_IO_ERROR_TIMED_OUT) {
            return platform::kCredentialNoService;
        }
        g_autofree char* name = g_dbus_error_get_remote_error(error);
        if (g_strcmp0(name, "org.freedesktop.Secret.Error.IsLocked") == 0) {
            return platform::kCredentialLocked;
        }
        if (g_strcmp0(name, "org.freedesktop.Secret.Error.NoSuchObject") == 0) {
            return platform::kCredentialItemNotFound;
        }
    }
    return platform::kCredentialServiceFailed;
}

SessionBus::~SessionBus() {
    g_clear_object(&_connection);
}

GDBusConnection* SessionBus::connection() {
    if (_connection && g_dbus_connection_is_closed(_connection)) {
        g_clear_object(&_connection);
    }
    if (!_connection) {
        _connection = g_bus_get_sync(G_BUS_TYPE_SESSION, nullptr, nullptr);
        if (_connection) {
            g_dbus_connection_set_exit_on_close(_connection, FALSE);
        }
    }
    return _connection;
}

VariantPointer callMethod(GDBusConnection* connection, const char* name, const char* path,
                          const char* interface, const char* method, GVariant* arguments, Status& status) {
    ErrorSlot error;
    VariantPointer answer(g_dbus_connection_call_sync(connection, name, path, interface, method, arguments,
                                                      nullptr, G_DBUS_CALL_FLAGS_NONE, -1, nullptr,
                                                      error.out()));
    status = answer ? platform::kCredentialSuccess : statusOf(error.get());
    return answer;
}

bool hasOwner(GDBusConnection* connection, const char* name) {
    Status status = 0;
    const VariantPointer answer =
        callMethod(connection, "org.freedesktop.DBus", "/org/freedesktop/DBus", "org.freedesktop.DBus",
                   "NameHasOwner", g_variant_new("(s)", name), status);
    gboolean has = FALSE;
    if (answer) {
        g_variant_get(answer.get(), "(b)", &has);
    }
    return has != FALSE;
}

} // namespace welcomer::desktop
