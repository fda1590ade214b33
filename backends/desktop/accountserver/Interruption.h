// Has transfers end that others wait for.

#pragma once

#include <chrono>
#include <condition_variable>
#include <curl/curl.h>
#include <mutex>
#include <set>

namespace welcomer::desktop {

// Any thread.
class Interruption {
  public:
    // Wakes every transfer, now and from now on.
    void stop();
    bool isStopped();

    // Waits, for less where it is stopped.
    void wait(std::chrono::milliseconds duration);

    // A transfer that is to be woken, for as long as this lives.
    class Registration {
      public:
        Registration(Interruption& interruption, CURLM* transfer);
        ~Registration();
        Registration(const Registration&) = delete;
        Registration& operator=(const Registration&) = delete;

      private:
        Interruption& _interruption;
        CURLM* const _transfer;
    };

  private:
    std::mutex _mutex;
    std::condition_variable _changed;
    std::set<CURLM*> _transfers;
    bool _isStopped = false;
};

} // namespace welcomer::desktop
