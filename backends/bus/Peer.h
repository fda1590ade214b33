// Who is spoken to on a bus, whatever library does the talking.

#pragma once

#include <chrono>

namespace welcomer::bus {

// A service's object on a bus, as every call takes it. Texts are borrowed.
struct Peer {
    const char* name;
    const char* path;
    const char* interface;
    std::chrono::nanoseconds limit; // how long each call may take

    // Another object of the same service, and the same with other words or within another time.
    constexpr Peer at(const char* otherPath) const { return {name, otherPath, interface, limit}; }
    constexpr Peer as(const char* otherInterface) const { return {name, path, otherInterface, limit}; }
    constexpr Peer within(std::chrono::nanoseconds otherLimit) const {
        return {name, path, interface, otherLimit};
    }
};

// The bus itself, which answers at once where it answers at all.
inline constexpr Peer kBusPeer = {"org.freedesktop.DBus", "/org/freedesktop/DBus", "org.freedesktop.DBus",
                                  std::chrono::seconds(5)};

} // namespace welcomer::bus
