// The session bus, and what its errors mean to a credential store.

#pragma once

#include "backends/desktop/GLibPointer.h"

#include <cstdint>

namespace welcomer::desktop {

inline constexpr char kSecretServiceName[] = "org.freedesktop.secrets";
inline constexpr char kSecretServicePath[] = "/org/freedesktop/secrets";

// The platform::CredentialStatus that an error of a call stands for. Any thread.
std::int32_t statusOf(const GError* error);

// Keeps the process's one connection to the session bus, so that whatever shares it in this process survives
// the bus: left alone, GLib ends the process when the connection closes. One thread at a time.
class SessionBus {
  public:
    SessionBus() = default;
    ~SessionBus();
    SessionBus(const SessionBus&) = delete;
    SessionBus& operator=(const SessionBus&) = delete;

    // The connection, borrowed until the next call; a new one when the old one has closed. Null when there is
    // no bus.
    GDBusConnection* connection();

  private:
    GDBusConnection* _connection = nullptr;
};

// Calls a method and waits for its answer, without a prompt and for up to 25 seconds.
//  arguments  a floating reference is taken
//  status     kCredentialSuccess, or what the error means
//  result     the answer, or null
VariantPointer callMethod(GDBusConnection* connection, const char* name, const char* path,
                          const char* interface, const char* method, GVariant* arguments,
                          std::int32_t& status);

// Whether somebody owns a name on the bus.
bool hasOwner(GDBusConnection* connection, const char* name);

} // namespace welcomer::desktop
