// Simulated time that remembers how it was used.

#pragma once

#include "backends/simulated/VirtualTime.h"

#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

namespace welcomer::fakes {

// Any thread, as simulated time itself.
class RecordedTime final : public simulated::VirtualTime {
  public:
    // One call that waited, as it was asked for.
    struct Wait {
        enum class Kind { Sleep, Run, Group };
        Kind kind;
        std::chrono::nanoseconds duration;
        friend bool operator==(const Wait&, const Wait&) = default;
    };

    using VirtualTime::VirtualTime;

    void sleep(std::chrono::nanoseconds duration) override;
    std::shared_ptr<platform::RunLoop> current() override;
    std::shared_ptr<platform::DispatchQueue> createSerial(const std::string& name) override;
    std::shared_ptr<platform::WorkGroup> createGroup() override;

    // Runs the queues' blocks that are due, and what they post, without advancing time or being a wait.
    void settle();

    // Every wait so far, in the order of the calls. To have something happen at a given time, post it to
    // global() with a delay.
    std::vector<Wait> waits() const { return _records->waits(); }

    // The names of the serial queues created so far, in the order of their creation.
    std::vector<std::string> queueNames() const;

  private:
    // Shared with the handles, which may outlive this.
    class Records {
      public:
        void add(Wait::Kind kind, std::chrono::nanoseconds duration) {
            const std::lock_guard lock(_mutex);
            _waits.push_back({kind, duration});
        }
        std::vector<Wait> waits() const {
            const std::lock_guard lock(_mutex);
            return _waits;
        }

      private:
        mutable std::mutex _mutex;
        std::vector<Wait> _waits;
    };
    class Loop;
    class Group;

    const std::shared_ptr<Records> _records = std::make_shared<Records>();
    mutable std::mutex _mutex; // guards what follows
    std::map<const platform::RunLoop*, std::shared_ptr<platform::RunLoop>> _loops;
    std::vector<std::string> _queueNames;
};

} // namespace welcomer::fakes
