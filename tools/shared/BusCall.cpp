#include "tools/shared/BusCall.h"

#include <cstdarg>
#include <system_error>
#include <systemd/sd-bus.h>

namespace welcomer::bus {

namespace {

// The error of one call, freed at its end.
class CallError {
  public:
    CallError() = default;
    ~CallError() { sd_bus_error_free(&_error); }
    CallError(const CallError&) = delete;
    CallError& operator=(const CallError&) = delete;

    sd_bus_error* get() { return &_error; }

    // What went wrong in a call with this negative result.
    platform::Error asError(int result) const {
        return {-result, _error.message ? _error.message : std::generic_category().message(-result)};
    }

  private:
    sd_bus_error _error{};
};

} // namespace

void CloseBus::operator()(sd_bus* bus) const {
    sd_bus_flush_close_unref(bus);
}

void DropMessage::operator()(sd_bus_message* message) const {
    sd_bus_message_unref(message);
}

Bus openSessionBus() {
    sd_bus* bus = nullptr;
    return sd_bus_open_user(&bus) < 0 ? nullptr : Bus(bus);
}

Bus openSystemBus() {
    sd_bus* bus = nullptr;
    return sd_bus_open_system(&bus) < 0 ? nullptr : Bus(bus);
}

Bus openBusAt(const std::string& address) {
    sd_bus* made = nullptr;
    if (sd_bus_new(&made) < 0) {
        return nullptr;
    }
    Bus bus(made);
    const bool connected = sd_bus_set_address(made, address.c_str()) >= 0 &&
                           sd_bus_set_bus_client(made, 1) >= 0 && sd_bus_start(made) >= 0;
    return connected ? std::move(bus) : nullptr;
}

Call::Call(sd_bus* bus, const Peer& peer, const char* method)
    : _bus(bus),
      _microseconds(static_cast<std::uint64_t>(peer.limit.count())) {
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
    if (_result < 0) {
        return platform::Outcome::failure(error.asError(_result));
    }
    if (answer) {
        *answer = std::move(owned);
    }
    return platform::Outcome::success();
}

bool isRunning(sd_bus* bus, const Peer& peer) {
    const Peer busItself = {"org.freedesktop.DBus", "/org/freedesktop/DBus", "org.freedesktop.DBus",
                            peer.limit};
    Message answer;
    int hasOwner = 0;
    return Call(bus, busItself, "NameHasOwner").append("s", peer.name).send(&answer) &&
           sd_bus_message_read(answer.get(), "b", &hasOwner) >= 0 && hasOwner != 0;
}

} // namespace welcomer::bus
