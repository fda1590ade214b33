// Calls to NetworkManager on the system bus.

#pragma once

#include "backends/desktop/glib/Bus.h"

#include <nm-dbus-interface.h>

#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

namespace welcomer::desktop {

// What came of a call.
struct NetworkManagerReply {
    VariantPointer value;  // the results, a tuple; null when the call failed
    std::string errorName; // the D-Bus name of the error, empty when there is none
    std::string errorText; // for people
    explicit operator bool() const { return value != nullptr; }

    // The error as a NetworkConfigStatus: missing rights, what is gone and what makes no sense are told
    // apart.
    //  otherwise  for every other error
    std::int32_t status(std::int32_t otherwise) const;
};

// The properties of one object. What it does not have, or has as another type, is empty or null.
class NetworkManagerProperties {
  public:
    explicit NetworkManagerProperties(VariantPointer all) : _all(std::move(all)) {}

    VariantPointer value(const char* name, const char* type) const;
    std::string text(const char* name) const;
    // The path of another object; empty when there is none.
    std::string path(const char* name) const;
    // The first of a list of texts or of paths.
    std::string first(const char* name, const char* type) const;

  private:
    VariantPointer _all; // of type a{sv}, or null
};

// NetworkManager. Its object at this path is the manager itself.
inline constexpr Peer kNetworkManager = {NM_DBUS_SERVICE, NM_DBUS_PATH, NM_DBUS_INTERFACE,
                                         std::chrono::seconds(25)};

// Calls on a connection to the system bus of this process's own. It needs no main loop. Any thread; a child
// process cannot use its parent's.
class NetworkManagerBus {
  public:
    // The process's connection, made when it is first asked for and again when it was lost.
    //  result  null when there is no system bus that answers, or NetworkManager is not on it
    static std::shared_ptr<NetworkManagerBus> open();

    explicit NetworkManagerBus(BusConnection connection) : _connection(std::move(connection)) {}

    // Borrowed.
    GDBusConnection* connection() const { return _connection.get(); }

    // Calls a method and waits for its results; starts nothing.
    //  arguments  a tuple, taken over when floating, or null
    //  limit      how long to wait at most
    NetworkManagerReply call(const char* path, const char* interface, const char* method, GVariant* arguments,
                             std::chrono::milliseconds limit = kCallLimit) const;

    // An object's property, or null.
    VariantPointer property(const char* path, const char* interface, const char* name) const;

    // All properties of an object in one call; none when it is not there.
    NetworkManagerProperties properties(const std::string& path, const char* interface) const;

    static constexpr std::chrono::milliseconds kCallLimit{25'000};

  private:
    const BusConnection _connection;
};

} // namespace welcomer::desktop
