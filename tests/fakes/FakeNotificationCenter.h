// A notification centre for one thread.

#pragma once

#include "platform/NotificationCenter.h"

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace welcomer::fakes {

class FakeNotificationCenter final : public platform::NotificationCenter {
  public:
    std::unique_ptr<platform::NotificationObservation> addObserver(const std::string& name,
                                                                   Observer observer) override {
        const std::uint64_t id = _nextID++;
        _observers.emplace(id, Entry{name, std::move(observer)});
        return std::make_unique<Observation>(*this, id);
    }

    void post(const platform::Notification& notification) override {
        posted.push_back(notification);
        const std::uint64_t end = _nextID; // whoever is added from now on is not called
        for (auto next = _observers.begin(); next != _observers.end() && next->first < end;) {
            const std::uint64_t id = next->first;
            if (next->second.name == notification.name) {
                const Observer observer = next->second.observer; // it may remove itself
                observer(notification);
            }
            next = _observers.upper_bound(id);
        }
    }

    // How many observers a name has.
    std::size_t observerCount(const std::string& name) const {
        std::size_t count = 0;
        for (const auto& [id, entry] : _observers) {
            count += entry.name == name ? 1 : 0;
        }
        return count;
    }

    // Everything that was posted, in order.
    std::vector<platform::Notification> posted;

  private:
    struct Entry {
        std::string name;
        Observer observer;
    };

    class Observation : public platform::NotificationObservation {
      public:
        Observation(FakeNotificationCenter& center, std::uint64_t id) : _center(&center), _id(id) {}
        ~Observation() override { _center->_observers.erase(_id); }
        Observation(const Observation&) = delete;
        Observation& operator=(const Observation&) = delete;

      private:
        FakeNotificationCenter* _center;
        std::uint64_t _id;
    };

    std::uint64_t _nextID = 0;
    std::map<std::uint64_t, Entry> _observers; // by id, which is the order of adding
};

} // namespace welcomer::fakes
