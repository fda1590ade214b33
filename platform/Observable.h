// An object whose changes others can observe, by key.

#pragma once

#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer::platform {

class Observable {
  public:
    // Observing lasts as long as this is held. It may outlive the object that is observed.
    using Observation = std::shared_ptr<const void>;

    Observable() = default;
    Observable(const Observable&) = delete;
    Observable& operator=(const Observable&) = delete;
    virtual ~Observable() = default;

    // Has a callback called before each change of a key and another one after it, on the thread that makes
    // the change and in the order of registration; either may be empty. The callbacks may read the object,
    // and may register and end observations: those take part from the next change on. They do not throw. Any
    // thread.
    [[nodiscard]] Observation observe(std::string key, std::function<void()> before,
                                      std::function<void()> after);

  protected:
    // Makes a change between the callbacks of those who observe its key or a key derived from it. Any thread.
    void change(std::string_view key, const std::function<void()>& makeChange);

    // The keys that a derived key is computed from; a change of one of them is a change of the derived one.
    // Does not block.
    virtual std::vector<std::string> keysAffecting(std::string_view derivedKey) const;

  private:
    struct Observer;

    std::vector<std::shared_ptr<const Observer>> _observersOf(std::string_view key);

    std::mutex _mutex;
    std::vector<std::weak_ptr<const Observer>> _observers;
};

} // namespace welcomer::platform
