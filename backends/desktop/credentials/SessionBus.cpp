#include "backends/desktop/credentials/SessionBus.h"

#include "backends/desktop/credentials/PromptWait.h"
#include "platform/CredentialStore.h"

#include <algorithm>
#include <libsecret/secret.h>

namespace welcomer::desktop {

namespace {

using Status = std::int32_t;

constexpr char kBusName[] = "org.freedesktop.DBus";
constexpr char kBusPath[] = "/org/freedesktop/DBus";

Status statusOfBusError(int code) {
    switch (code) {
    case G_DBUS_ERROR_TIMED_OUT: // of an activation
    case G_DBUS_ERROR_TIMEOUT:
        return kTimedOut;
    case G_DBUS_ERROR_NO_SERVER:
    case G_DBUS_ERROR_DISCONNECTED:
    case G_DBUS_ERROR_NO_NETWORK:
        return platform::kCredentialBusDied;
    case G_DBUS_ERROR_UNKNOWN_OBJECT: // the item is gone
    case G_DBUS_ERROR_UNKNOWN_INTERFACE:
    case G_DBUS_ERROR_UNKNOWN_METHOD:
        return platform::kCredentialItemNotFound;
    default:
        return platform::kCredentialServiceFailed;
    }
}

int milliseconds(const Deadline& deadline) {
    return static_cast<int>(std::chrono::ceil<std::chrono::milliseconds>(deadline.left()).count());
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
            return platform::kCredentialBusDied;
        }
        if (error->code == G_IO_ERROR_TIMED_OUT) {
            return kTimedOut;
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

GDBusConnection* SessionBus::connection(const Deadline& deadline, Status& status) {
    if (_connection && g_dbus_connection_is_closed(_connection)) {
        g_clear_object(&_connection);
    }
    if (!_connection) {
        PromptWait wait(deadline.left());
        g_bus_get(G_BUS_TYPE_SESSION, wait.cancellable(), PromptWait::done, wait.argument());
        GAsyncResult* const result = wait.wait();
        _connection = result ? g_bus_get_finish(result, nullptr) : nullptr;
        if (_connection) {
            g_dbus_connection_set_exit_on_close(_connection, FALSE);
        } else {
            status = wait.wasGivenUp() ? kTimedOut : static_cast<Status>(platform::kCredentialBusDied);
        }
    }
    return _connection;
}

VariantPointer callMethod(GDBusConnection* connection, const char* name, const char* path,
                          const char* interface, const char* method, GVariant* arguments,
                          const Deadline& deadline, Status& status) {
    const VariantPointer owned(arguments ? g_variant_ref_sink(arguments) : nullptr);
    const int limit = milliseconds(deadline);
    if (limit == 0) {
        status = kTimedOut;
        return nullptr;
    }
    ErrorSlot error;
    VariantPointer answer(g_dbus_connection_call_sync(connection, name, path, interface, method, owned.get(),
                                                      nullptr, G_DBUS_CALL_FLAGS_NO_AUTO_START, limit,
                                                      nullptr, error.out()));
    status = answer ? platform::kCredentialSuccess : statusOf(error.get());
    return answer;
}

Status startSecretService(GDBusConnection* connection, const Deadline& deadline) {
    if (hasOwner(connection, kSecretServiceName, deadline)) {
        return platform::kCredentialSuccess;
    }
    ErrorSlot error;
    const VariantPointer answer(g_dbus_connection_call_sync(
        connection, kBusName, kBusPath, kBusName, "StartServiceByName",
        g_variant_new("(su)", kSecretServiceName, 0U), nullptr, G_DBUS_CALL_FLAGS_NONE,
        std::max(milliseconds(deadline), 1), nullptr, error.out()));
    if (answer) {
        return platform::kCredentialSuccess;
    }
    if (g_error_matches(error.get(), G_DBUS_ERROR, G_DBUS_ERROR_SERVICE_UNKNOWN)) {
        return platform::kCredentialNoService;
    }
    const Status status = statusOf(error.get());
    return status == kTimedOut || status == platform::kCredentialBusDied
               ? status
               : static_cast<Status>(platform::kCredentialStartFailed);
}

bool hasOwner(GDBusConnection* connection, const char* name, const Deadline& deadline) {
    Status status = 0;
    const VariantPointer answer = callMethod(connection, kBusName, kBusPath, kBusName, "NameHasOwner",
                                             g_variant_new("(s)", name), deadline, status);
    gboolean has = FALSE;
    if (answer) {
        g_variant_get(answer.get(), "(b)", &has);
    }
    return has != FALSE;
}

} // namespace welcomer::desktop
