// A property whose reads and writes are each indivisible.

#pragma once

#include <atomic>
#include <mutex>
#include <utility>

namespace welcomer::platform {

// Holds its own copy of a value; any thread may read and write it. Nothing holds several of these together.
template <class Value>
class Atomic {
  public:
    Atomic() = default;
    explicit Atomic(Value value) : _value(std::move(value)) {}

    // A copy of the value.
    Value get() const {
        const std::lock_guard lock(_mutex);
        return _value;
    }

    void set(const Value& value) { set(Value(value)); }
    void set(Value&& value) {
        const std::lock_guard lock(_mutex);
        _value = std::move(value);
    }

  private:
    mutable std::mutex _mutex;
    Value _value{};
};

// A flag needs no lock.
template <>
class Atomic<bool> {
  public:
    Atomic() = default;
    explicit Atomic(bool value) : _value(value) {}

    bool get() const { return _value.load(); }
    void set(bool value) { _value.store(value); }

  private:
    std::atomic<bool> _value = false;
};

} // namespace welcomer::platform
