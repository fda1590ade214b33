// Connections to a bus, and calls on them, all of which end in time.

#pragma once

#include "backends/desktop/glib/Deadline.h"
#include "backends/desktop/glib/Peer.h"
#include "backends/desktop/glib/Pointers.h"

#include <mutex>

namespace welcomer::desktop {

using BusConnection = ObjectPointer<GDBusConnection>;

// A connection to a bus that survives the bus: left alone, GLib ends the process when a connection closes. It
// is made when it is first asked for, and again when it was lost. Any thread; a child process cannot use its
// parent's.
class Bus {
  public:
    // Whose the connection is: this object's own, or the one that the process's libraries share.
    enum class Sharing { Own, WithLibraries };

    Bus(GBusType type, Sharing sharing) : _type(type), _sharing(sharing) {}

    //  error   why there is none: of G_IO_ERROR, G_IO_ERROR_TIMED_OUT when nobody has answered
    //  result  a reference, or null
    BusConnection connection(const Deadline& deadline, ErrorSlot& error);

  private:
    BusConnection _connect(const Deadline& deadline, ErrorSlot& error) const;

    const GBusType _type;
    const Sharing _sharing;
    std::mutex _mutex;
    BusConnection _kept; // the last one
};

// Calls a method and waits for its answer; starts nobody. Any thread, as all that follows.
//  arguments  a tuple, or null; a floating reference is taken
//  type       that of the answer, or null for any; another one is an error
//  result     the answer, or null
VariantPointer call(GDBusConnection* bus, const Peer& peer, const char* method, GVariant* arguments,
                    const char* type, ErrorSlot& error);

// Reads one property, or all of them as "a{sv}", of the peer's interface.
//  result  null where it cannot be read
VariantPointer readProperty(GDBusConnection* bus, const Peer& peer, const char* name, ErrorSlot& error);
VariantPointer readProperties(GDBusConnection* bus, const Peer& peer, ErrorSlot& error);

// Writes one property, and returns when it has been taken.
//  value   a floating reference is taken
//  result  whether it has
bool writeProperty(GDBusConnection* bus, const Peer& peer, const char* name, GVariant* value,
                   ErrorSlot& error);

// In what state a service is that a name on a bus stands for.
enum class BusName {
    Unknown,   // the bus does not answer
    Nobody,    // it does not run, and the bus knows nothing that it could start
    Startable, // it does not run; the bus can start it
    Owned,     // it runs
};

// Looks at a peer's name, asked of the bus alone, which has until the peer's limit for each of two answers.
BusName lookAtName(GDBusConnection* bus, const Peer& peer);

// Whether somebody has a peer's name; not, where the bus does not answer.
bool hasOwner(GDBusConnection* bus, const Peer& peer);

// Whether a call was not answered in time.
bool isTimeOut(const ErrorSlot& error);

} // namespace welcomer::desktop
