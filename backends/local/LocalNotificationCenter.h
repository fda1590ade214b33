// Broadcasts within this process, on a mutex.

#pragma once

#include "platform/NotificationCenter.h"

#include <memory>
#include <string>

namespace welcomer::local {

// No lock is held while an observer is called. Observations may outlive the centre.
class LocalNotificationCenter final : public platform::NotificationCenter {
  public:
    LocalNotificationCenter();

    std::unique_ptr<platform::NotificationObservation> addObserver(const std::string& name,
                                                                   Observer observer) override;
    void post(const platform::Notification& notification) override;

  private:
    struct Registry;
    class Observation;

    const std::shared_ptr<Registry> _registry;
};

} // namespace welcomer::local
