// A property whose reads and writes are each indivisible.

#pragma once

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

    void set(Value value) {
        const std::lock_guard lock(_mutex);
        std::swap(_value, value); // the old value is destroyed after the lock is released
    }

  private:
    mutable std::mutex _mutex;
    Value _value{};
};

} // namespace welcomer::platform
