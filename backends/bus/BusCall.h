// Calls to services on a bus, without GLib: connections, one call, and who has a name.

#pragma once

#include "backends/bus/Peer.h"
#include "platform/Error.h"

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

struct sd_bus;
struct sd_bus_message;

namespace welcomer::bus {

struct CloseBus {
    void operator()(sd_bus* bus) const;
};
using Bus = std::unique_ptr<sd_bus, CloseBus>;

struct DropMessage {
    void operator()(sd_bus_message* message) const;
};
using Message = std::unique_ptr<sd_bus_message, DropMessage>;

// The bus of the session that this process runs in, the machine's own, or the one at an address, once it has let
// us in.
//  limit   how long that may take
//  why     receives the error's number and text where there is none; may be null
//  result  null where there is none
// One thread for each bus, as for all that is done on it.
Bus openSessionBus(std::chrono::nanoseconds limit, platform::Error* why = nullptr);
Bus openSystemBus(std::chrono::nanoseconds limit, platform::Error* why = nullptr);
Bus openBusAt(const std::string& address, std::chrono::nanoseconds limit, platform::Error* why = nullptr);

// One call of a method. Starts nobody. Its arguments are added in their order; what cannot be added is told
// when the call is sent.
class Call {
  public:
    //  bus  borrowed
    Call(sd_bus* bus, const Peer& peer, const char* method);

    // Adds values of these types, as sd_bus_message_append() takes them.
    Call& append(const char* types, ...);
    // Adds an array of texts, or one of bytes.
    Call& append(const std::vector<std::string>& texts);
    Call& appendBytes(const void* bytes, std::size_t size);
    // Opens a container, 'a', 'v' or 'r', with these contents, and closes the innermost ones.
    Call& open(char kind, const char* contents);
    Call& close(int count = 1);

    // Sends it, and waits for the answer.
    //  answer  where to put it, or null; written on success only
    //  result  the error's number and text
    platform::Outcome send(Message* answer = nullptr);

    // Whether the peer or the bus has answered with the error of this name.
    bool hasFailedWith(const char* name) const { return _errorName == name; }

  private:
    // Keeps the first failure.
    Call& _note(int result);

    sd_bus* const _bus;
    const std::uint64_t _microseconds;
    Message _message;
    int _result;
    std::string _errorName; // empty where nobody has named one
};

// Whether a peer runs; not, where the bus does not answer.
//  why  receives the error's number and text in that case; may be null
bool isRunning(sd_bus* bus, const Peer& peer, platform::Error* why = nullptr);

} // namespace welcomer::bus
