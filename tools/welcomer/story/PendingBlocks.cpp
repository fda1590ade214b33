#include "tools/welcomer/story/PendingBlocks.h"

#include <utility>

namespace welcomer::tool {

PendingBlocks::PendingBlocks(platform::DispatchQueues& queues)
    : _queues(queues),
      _group(queues.createGroup()),
      _global(queues.global(), _group) {}

void PendingBlocks::wait() {
    while (!_group->wait(std::chrono::hours(1))) {
    }
}

std::function<void()> PendingBlocks::CountedQueue::_counted(std::function<void()> block) {
    _group->enter();
    return [group = _group, block = std::move(block)] {
        block();
        group->leave();
    };
}

} // namespace welcomer::tool
