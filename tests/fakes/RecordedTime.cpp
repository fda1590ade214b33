#include "tests/fakes/RecordedTime.h"

#include <utility>

namespace welcomer::fakes {

using std::chrono::nanoseconds;

class RecordedTime::Loop final : public platform::RunLoop {
  public:
    Loop(std::shared_ptr<platform::RunLoop> loop, std::shared_ptr<Records> records)
        : _loop(std::move(loop)),
          _records(std::move(records)) {}

    void run(nanoseconds duration) override {
        _records->add(Wait::Kind::Run, duration);
        _loop->run(duration);
    }
    void perform(std::function<void()> block) override { _loop->perform(std::move(block)); }
    std::unique_ptr<platform::RunLoopPort> attachPort() override { return _loop->attachPort(); }

  private:
    const std::shared_ptr<platform::RunLoop> _loop;
    const std::shared_ptr<Records> _records;
};

class RecordedTime::Group final : public platform::WorkGroup {
  public:
    Group(std::shared_ptr<platform::WorkGroup> group, std::shared_ptr<Records> records)
        : _group(std::move(group)),
          _records(std::move(records)) {}

    void enter() override { _group->enter(); }
    void leave() override { _group->leave(); }
    bool wait(nanoseconds timeOut) override {
        _records->add(Wait::Kind::Group, timeOut);
        return _group->wait(timeOut);
    }

  private:
    const std::shared_ptr<platform::WorkGroup> _group;
    const std::shared_ptr<Records> _records;
};

void RecordedTime::sleep(nanoseconds duration) {
    _records->add(Wait::Kind::Sleep, duration);
    VirtualTime::sleep(duration);
}

std::shared_ptr<platform::RunLoop> RecordedTime::current() {
    std::shared_ptr<platform::RunLoop> loop = VirtualTime::current();
    const std::lock_guard lock(_mutex);
    std::shared_ptr<platform::RunLoop>& recorded = _loops[loop.get()];
    if (!recorded) {
        recorded = std::make_shared<Loop>(std::move(loop), _records);
    }
    return recorded;
}

std::shared_ptr<platform::DispatchQueue> RecordedTime::createSerial(const std::string& name) {
    const std::lock_guard lock(_mutex);
    _queueNames.push_back(name);
    return VirtualTime::createSerial(name);
}

std::shared_ptr<platform::WorkGroup> RecordedTime::createGroup() {
    return std::make_shared<Group>(VirtualTime::createGroup(), _records);
}

void RecordedTime::settle() {
    // Each of these waits runs what was posted before it: as many as any test's blocks post one another.
    for (int round = 0; round < 100; ++round) {
        VirtualTime::sleep(nanoseconds::zero());
    }
}

std::vector<std::string> RecordedTime::queueNames() const {
    const std::lock_guard lock(_mutex);
    return _queueNames;
}

} // namespace welcomer::fakes
