// Who is spoken to on a bus.

#pragma once

#include <chrono>

namespace welcomer::desktop {

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

// How long a report waits for an answer: what takes longer does not answer.
inline constexpr std::chrono::seconds kReportLimit{5};

// The bus itself.
inline constexpr Peer kBusPeer = {"org.freedesktop.DBus", "/org/freedesktop/DBus", "org.freedesktop.DBus",
                                  kReportLimit};

} // namespace welcomer::desktop
