#include "platform/Observable.h"

#include <algorithm>
#include <utility>

namespace welcomer::platform {

struct Observable::Observer {
    std::string key;
    std::function<void()> before;
    std::function<void()> after;
};

Observable::Observation Observable::observe(std::string key, std::function<void()> before,
                                            std::function<void()> after) {
    auto observer =
        std::make_shared<const Observer>(Observer{std::move(key), std::move(before), std::move(after)});
    const std::lock_guard lock(_mutex);
    std::erase_if(_observers, [](const auto& each) { return each.expired(); });
    _observers.push_back(observer);
    return observer;
}

void Observable::change(std::string_view key, const std::function<void()>& makeChange) {
    const auto observers = _observersOf(key);
    for (const auto& observer : observers) {
        if (observer->before) {
            observer->before();
        }
    }
    makeChange();
    for (const auto& observer : observers) {
        if (observer->after) {
            observer->after();
        }
    }
}

std::vector<std::string> Observable::keysAffecting(std::string_view) const {
    return {};
}

std::vector<std::shared_ptr<const Observable::Observer>> Observable::_observersOf(std::string_view key) {
    std::vector<std::shared_ptr<const Observer>> found;
    const std::lock_guard lock(_mutex);
    for (const auto& each : _observers) {
        const std::shared_ptr<const Observer> observer = each.lock();
        if (!observer) {
            continue;
        }
        if (observer->key == key || std::ranges::count(keysAffecting(observer->key), key) > 0) {
            found.push_back(observer);
        }
    }
    return found;
}

} // namespace welcomer::platform
