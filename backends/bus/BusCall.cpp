#include "backends/bus/BusCall.h"

#include <cerrno>
#include <cstdarg>
#include <system_error>
#include <systemd/sd-bus.h>

namespace welcomer::bus {

namespace {

using std::chrono::nanoseconds;

// As sd-bus takes a limit, for which 0 is none.
std::uint64_t wholeMicroseconds(nanoseconds limit) {
    const auto count = std::chrono::ceil<std::chrono::microseconds>(limit).count();
    return count > 0 ? static_cast<std::uint64_t>(count) : 1;
}

platform::Error errorOf(int result) {
    return {-result, std::generic_category().message(-result)};
}

// Waits until a bus has let us in: a call would wait for that without a limit.
int waitUntilReady(sd_bus* bus, nanoseconds limit) {
    using std::chrono::steady_clock;
    const auto end = steady_clock::now() + limit;
    int result = 0;
    while ((result = sd_bus_is_ready(bus)) == 0) {
        result = sd_bus_process(bus, nullptr);
        if (result == 0) {
            const nanoseconds left = end - steady_clock::now();
            result = left <= nanoseconds(0) ? -ETIMEDOUT : sd_bus_wait(bus, wholeMicroseconds(left));
        }
        if (result < 0) {
            break;
        }
    }
    return result;
}

//  result  of opening it
//  opened  owned; null where that has failed
Bus whenReady(int result, sd_bus* opened, nanoseconds limit, platform::Error* why) {
    Bus bus(opened);
    result = result < 0 ? result : waitUntilReady(opened, limit);
    if (result >= 0) {
        return bus;
    }
    if (why) {
        *why = errorOf(result);
    }
    return nullptr;
}

// The error of one call, freed at its end.
class CallError {
  public:
    CallError() = default;
    ~CallError() { sd_bus_error_free(&_error); }
    CallError(const CallError&) = delete;
    CallError& operator=(const CallError&) = delete;

    sd_bus_error* get() { return &_error; }

    std::string name() const { return _error.name ? _error.name : ""; }

    // What went wrong in a call with this negative result.
    platform::Error asError(int result) const {
        return _error.message ? platform::Error{-result, _error.message} : errorOf(result);
    }

  private:
    sd_bus_error _error{};
};

} // namespace

void CloseBus::operator()(sd_bus* bus) const {
    sd_bus_close_unref(bus); // every call has waited for its answer: nothing is left to be sent
}

void DropMessage::operator()(sd_bus_message* message) const {
    sd_bus_message_unref(message);
}

Bus openSessionBus(nanoseconds limit, platform::Error* why) {
    sd_bus* bus = nullptr;
    const int result = sd_bus_open_user(&bus);
    return whenReady(result, bus, limit, why);
}

Bus openSystemBus(nanoseconds limit, platform::Error* why) {
    sd_bus* bus = nullptr;
    const int result = sd_bus_open_system(&bus);
    return whenReady(result, bus, limit, why);
}

Bus openBusAt(const std::string& address, nanoseconds limit, platform::Error* why) {
    sd_bus* bus = nullptr;
    int result = sd_bus_new(&bus);
    result = result < 0 ? result : sd_bus_set_address(bus, address.c_str());
    result = result < 0 ? result : sd_bus_set_bus_client(bus, 1);
    result = result < 0 ? result : sd_bus_start(bus);
    return whenReady(result, bus, limit, why);
}

Call::Call(sd_bus* bus, const Peer& peer, const char* method)
    : _bus(bus),
      _microseconds(wholeMicroseconds(peer.limit)) {
    sd_bus_message* made = nullptr;
    _result = sd_bus_message_new_method_call(bus, &made, peer.name, peer.path, peer.interface, method);
    _message.reset(made);
    _note(made ? sd_bus_message_set_auto_start(made, 0) : _result);
}

Call& Call::_note(int result) {
    _result = _result < 0 ? _result : result;
    return *this;
}

Call& Call::append(const char* types, ...) {
    va_list values;
    va_start(values, types);
    _note(_result < 0 ? _result : sd_bus_message_appendv(_message.get(), types, values));
    va_end(values);
    return *this;
}

Call& Call::append(const std::vector<std::string>& texts) {
    open('a', "s");
    for (const std::string& text : texts) {
        append("s", text.c_str());
    }
    return close();
}

Call& Call::appendBytes(const void* bytes, std::size_t size) {
    return _note(_result < 0 ? _result : sd_bus_message_append_array(_message.get(), 'y', bytes, size));
}

Call& Call::open(char kind, const char* contents) {
    return _note(_result < 0 ? _result : sd_bus_message_open_container(_message.get(), kind, contents));
}

Call& Call::close(int count) {
    for (int closed = 0; closed < count; ++closed) {
        _note(_result < 0 ? _result : sd_bus_message_close_container(_message.get()));
    }
    return *this;
}

platform::Outcome Call::send(Message* answer) {
    CallError error;
    sd_bus_message* received = nullptr;
    _note(_result < 0 ? _result : sd_bus_call(_bus, _message.get(), _microseconds, error.get(), &received));
    Message owned(received);
    _errorName = error.name();
    if (_result < 0) {
        return platform::Outcome::failure(error.asError(_result));
    }
    if (answer) {
        *answer = std::move(owned);
    }
    return platform::Outcome::success();
}

bool isRunning(sd_bus* bus, const Peer& peer, platform::Error* why) {
    Message answer;
    const platform::Outcome asked =
        Call(bus, kBusPeer.within(peer.limit), "NameHasOwner").append("s", peer.name).send(&answer);
    if (!asked && why) {
        *why = asked.error;
    }
    int hasOwner = 0;
    return asked && sd_bus_message_read(answer.get(), "b", &hasOwner) >= 0 && hasOwner != 0;
}

} // namespace welcomer::bus
