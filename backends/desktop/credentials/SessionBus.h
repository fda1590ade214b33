// The session bus, and what its errors mean to a credential store.

#pragma once

#include "backends/desktop/GLibPointer.h"
#include "backends/desktop/credentials/Deadline.h"

#include <cstdint>

namespace welcomer::desktop {

inline constexpr char kSecretServiceName[] = "org.freedesktop.secrets";
inline constexpr char kSecretServicePath[] = "/org/freedesktop/secrets";

// The status of a call that was not answered in time, within this module: each operation has a number of its
// own for it.
inline constexpr std::int32_t kTimedOut = -1;

// The platform::CredentialStatus that an error of a call stands for, or kTimedOut. Any thread.
std::int32_t statusOf(const GError* error);

// Keeps the process's one connection to the session bus, so that whatever shares it in this process survives
// the bus: left alone, GLib ends the process when the connection closes. One thread at a time.
class SessionBus {
  public:
    SessionBus() = default;
    ~SessionBus();
    SessionBus(const SessionBus&) = delete;
    SessionBus& operator=(const SessionBus&) = delete;

    // The connection, borrowed until the next call; a new one when the old one has closed.
    //  status  where there is none: kCredentialBusDied, since nobody answers, or kTimedOut
    GDBusConnection* connection(const Deadline& deadline, std::int32_t& status);

  private:
    GDBusConnection* _connection = nullptr;
};

// Calls a method and waits for its answer, without a prompt.
//  arguments  a floating reference is taken
//  status     kCredentialSuccess, or what the error means
//  result     the answer, or null
VariantPointer callMethod(GDBusConnection* connection, const char* name, const char* path,
                          const char* interface, const char* method, GVariant* arguments,
                          const Deadline& deadline, std::int32_t& status);

// Sees to it that the Secret Service runs, and has the bus start it where that is needed.
//  result  kCredentialSuccess; kCredentialNoService where there is nothing to start;
//          kCredentialStartFailed, kCredentialBusDied, kTimedOut
std::int32_t startSecretService(GDBusConnection* connection, const Deadline& deadline);

// Whether somebody owns a name on the bus.
bool hasOwner(GDBusConnection* connection, const char* name, const Deadline& deadline);

} // namespace welcomer::desktop
