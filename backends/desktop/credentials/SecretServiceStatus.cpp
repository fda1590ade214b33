#include "backends/desktop/credentials/SecretServiceStatus.h"

#include "backends/desktop/glib/Pointers.h"
#include "platform/CredentialStore.h"

#include <libsecret/secret.h>
#include <string_view>

namespace welcomer::desktop {

namespace {

using Status = std::int32_t;

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
        const TextPointer text(g_dbus_error_get_remote_error(error));
        const std::string_view name = text ? text.get() : "";
        if (name == "org.freedesktop.Secret.Error.IsLocked") {
            return platform::kCredentialLocked;
        }
        if (name == "org.freedesktop.Secret.Error.NoSuchObject") {
            return platform::kCredentialItemNotFound;
        }
    }
    return platform::kCredentialServiceFailed;
}

} // namespace welcomer::desktop
