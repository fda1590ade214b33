// Has what others wait for end.

#pragma once

#include <chrono>
#include <condition_variable>
#include <functional>
#include <map>
#include <mutex>

namespace welcomer::desktop {

// Any thread.
class Interruption {
  public:
    // Wakes whoever waits, now and from now on.
    void stop();
    bool isStopped();

    // Waits, for less where it is stopped.
    void wait(std::chrono::milliseconds duration);

    // Something that is to be woken, for as long as this lives; at once where it is stopped already.
    class Registration {
      public:
        //  wake  called by whoever stops, on any thread; may not use the interruption
        Registration(Interruption& interruption, std::function<void()> wake);
        ~Registration();
        Registration(const Registration&) = delete;
        Registration& operator=(const Registration&) = delete;

      private:
        Interruption& _interruption;
    };

  private:
    std::mutex _mutex;
    std::condition_variable _changed;
    std::map<const Registration*, std::function<void()>> _waiting;
    bool _isStopped = false;
};

} // namespace welcomer::desktop
