// Broadcasts within this process.

#pragma once

#include "propertylist/PropertyList.h"

#include <functional>
#include <memory>
#include <string>

namespace welcomer::platform {

// One broadcast.
struct Notification {
    std::string name;
    const void* sender = nullptr;      // who broadcasts it; only ever compared
    PropertyList::Dictionary contents; // what it says
};

// Keeps an observer registered for as long as it lives. Destroyed on any thread, also within the observer's
// own call; a call that another thread has begun by then still finishes. Must not outlive its centre.
class NotificationObservation {
  public:
    virtual ~NotificationObservation() = default;
};

// The process's default centre. Any thread, also within an observer.
class NotificationCenter {
  public:
    using Observer = std::function<void(const Notification&)>;

    virtual ~NotificationCenter() = default;

    // Has the observer called for every notification of a name, from any sender. It is called on the posting
    // thread and must not throw.
    virtual std::unique_ptr<NotificationObservation> addObserver(const std::string& name,
                                                                 Observer observer) = 0;

    // Calls the observers that are registered for the notification's name, in the order in which they were
    // added, and returns after the last. One that is added meanwhile is not called, and one that is removed
    // before its turn neither.
    virtual void post(const Notification& notification) = 0;
};

} // namespace welcomer::platform
