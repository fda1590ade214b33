#include "backends/local/LocalNotificationCenter.h"

#include <atomic>
#include <mutex>
#include <utility>
#include <vector>

namespace welcomer::local {

namespace {

struct Entry {
    std::string name;
    platform::NotificationCenter::Observer observer;
    std::atomic<bool> isRemoved = false;
};

} // namespace

struct LocalNotificationCenter::Registry {
    std::mutex mutex;
    std::vector<std::shared_ptr<Entry>> entries; // in the order in which they were added
};

class LocalNotificationCenter::Observation final : public platform::NotificationObservation {
  public:
    Observation(std::shared_ptr<Registry> registry, std::shared_ptr<Entry> entry)
        : _registry(std::move(registry)),
          _entry(std::move(entry)) {}

    ~Observation() override {
        _entry->isRemoved = true;
        const std::lock_guard lock(_registry->mutex);
        std::erase(_registry->entries, _entry);
    }

    Observation(const Observation&) = delete;
    Observation& operator=(const Observation&) = delete;

  private:
    const std::shared_ptr<Registry> _registry;
    const std::shared_ptr<Entry> _entry;
};

LocalNotificationCenter::LocalNotificationCenter() : _registry(std::make_shared<Registry>()) {}

std::unique_ptr<platform::NotificationObservation>
LocalNotificationCenter::addObserver(const std::string& name, Observer observer) {
    auto entry = std::make_shared<Entry>();
    entry->name = name;
    entry->observer = std::move(observer);
    {
        const std::lock_guard lock(_registry->mutex);
        _registry->entries.push_back(entry);
    }
    return std::make_unique<Observation>(_registry, std::move(entry));
}

void LocalNotificationCenter::post(const platform::Notification& notification) {
    std::vector<std::shared_ptr<Entry>> concerned; // kept alive while they are called
    {
        const std::lock_guard lock(_registry->mutex);
        for (const auto& entry : _registry->entries) {
            if (entry->name == notification.name) {
                concerned.push_back(entry);
            }
        }
    }
    for (const auto& entry : concerned) {
        if (!entry->isRemoved) {
            entry->observer(notification);
        }
    }
}

} // namespace welcomer::local
