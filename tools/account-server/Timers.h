// What is to happen at a time to come, on one thread.

#pragma once

#include <chrono>
#include <functional>
#include <map>
#include <optional>

namespace welcomer::server {

// One thread.
class Timers {
  public:
    using Clock = std::chrono::steady_clock;
    using Entries = std::multimap<Clock::time_point, std::function<void()>>;

    // One thing that is to happen; does not outlive its timers. Goes with it when it goes.
    class Timer {
      public:
        explicit Timer(Timers& timers) : _timers(timers) {}
        ~Timer() { cancel(); }
        Timer(const Timer&) = delete;
        Timer& operator=(const Timer&) = delete;

        // Has something happen once, after so long and at no other time.
        void set(Clock::duration after, std::function<void()> action) {
            cancel();
            _entry = _timers._entries.emplace(Clock::now() + after, [this, action = std::move(action)] {
                _entry.reset();
                action();
            });
        }

        void cancel() {
            if (_entry) {
                _timers._entries.erase(*_entry);
                _entry.reset();
            }
        }

      private:
        Timers& _timers;
        std::optional<Entries::iterator> _entry;
    };

    // When the next thing is to happen; none where there is none.
    std::optional<Clock::time_point> next() const {
        return _entries.empty() ? std::nullopt : std::optional(_entries.begin()->first);
    }

    // Has happen what is due.
    void run() {
        const Clock::time_point now = Clock::now();
        while (!_entries.empty() && _entries.begin()->first <= now) {
            const auto due = _entries.extract(_entries.begin());
            due.mapped()();
        }
    }

  private:
    Entries _entries;
};

} // namespace welcomer::server
