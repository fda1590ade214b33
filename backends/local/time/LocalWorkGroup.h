// A group of work on a mutex and a condition variable.

#pragma once

#include "platform/DispatchQueue.h"

#include <condition_variable>
#include <cstdint>
#include <mutex>

namespace welcomer::local {

class LocalWorkGroup final : public platform::WorkGroup {
  public:
    void enter() override;
    void leave() override;
    bool wait(std::chrono::nanoseconds timeOut) override;

  private:
    std::mutex _mutex;
    std::condition_variable _emptied;
    std::int64_t _count = 0;
};

} // namespace welcomer::local
