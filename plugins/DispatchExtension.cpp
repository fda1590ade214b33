// Plug-ins' blocks on the main loop.

#include "log/PCLogManager.h"
#include "platform/Platform.h"
#include "plugins/HostExtensions.h"
#include "plugins/PluginInstances.h"
#include "plugins/PluginMark.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <exception>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <utility>
#include <vector>

namespace welcomer {

namespace {

struct Block {
    const wl_delegate* owner;
    void (*run)(void*);
    void (*drop)(void*);
    void* data;
};

// Calls one of a plug-in's functions; the thread is marked with its name meanwhile.
void callBlock(const std::string& name, void (*function)(void*), void* data) {
    const PluginMark mark(name.c_str());
    try {
        function(data);
    } catch (...) {
        WL_LOG("exception in a block of plug-in %@: %@", name, std::current_exception());
    }
}

class Blocks {
  public:
    void useLoop(std::shared_ptr<platform::RunLoop> loop) {
        const std::lock_guard lock(_mutex);
        _loop = std::move(loop);
    }

    //  result  0 without a main loop
    std::uint64_t add(const Block& block, std::chrono::nanoseconds delay) {
        const std::lock_guard lock(_mutex);
        if (!_loop) {
            return 0;
        }
        const std::uint64_t number = ++_last;
        _pending.emplace(number, block);
        try {
            _post(number, delay);
        } catch (...) {
            _pending.erase(number); // refused: it is neither run nor dropped
            throw;
        }
        return number;
    }

    bool cancel(const wl_delegate* owner, std::uint64_t number) {
        const std::optional<Block> block = _take(number, owner);
        if (block) {
            _drop(*block);
        }
        return block.has_value();
    }

    void dropAllOf(const wl_delegate* owner) {
        std::vector<Block> dropped;
        {
            const std::lock_guard lock(_mutex);
            std::erase_if(_pending, [&](const auto& each) {
                const bool isOwn = each.second.owner == owner;
                if (isOwn) {
                    dropped.push_back(each.second);
                }
                return isOwn;
            });
        }
        std::ranges::for_each(dropped, _drop);
    }

  private:
    void _post(std::uint64_t number, std::chrono::nanoseconds delay) {
        const auto perform = [this, loop = _loop, number] {
            loop->perform([this, number] { _run(number); });
        };
        if (delay.count() <= 0) {
            perform();
            return;
        }
        if (!_delays) {
            _delays =
                platform::current().dispatchQueues.createSerial("com.corvid.welcomer -- plug-ins' blocks");
        }
        _delays->asyncAfter(delay, perform);
    }

    void _run(std::uint64_t number) {
        if (const std::optional<Block> block = _take(number, std::nullopt)) {
            callBlock(pluginNameOf(block->owner).value_or("(unknown)"), block->run, block->data);
        }
    }

    // A pending block, which is then no longer pending; none where it is not, or not of the owner that is given.
    std::optional<Block> _take(std::uint64_t number, std::optional<const wl_delegate*> owner) {
        const std::lock_guard lock(_mutex);
        const auto found = _pending.find(number);
        if (found == _pending.end() || (owner && found->second.owner != *owner)) {
            return std::nullopt;
        }
        const Block block = found->second;
        _pending.erase(found);
        return block;
    }

    static void _drop(const Block& block) {
        if (block.drop) {
            callBlock(pluginNameOf(block.owner).value_or("(unknown)"), block.drop, block.data);
        }
    }

    std::mutex _mutex;
    std::shared_ptr<platform::RunLoop> _loop;
    std::shared_ptr<platform::DispatchQueue> _delays; // a serial queue: blocks of one delay keep their order
    std::map<std::uint64_t, Block> _pending;
    std::uint64_t _last = 0;
};

// Never destroyed: plug-in threads may still call while the process ends.
Blocks& blocks() {
    static auto* const all = new Blocks;
    return *all;
}

// What no clock can reach never passes, and what is no number has passed.
std::chrono::nanoseconds delayOf(double seconds) {
    constexpr double kLongest = 1e9;
    if (!(seconds > 0)) {
        return std::chrono::nanoseconds(0);
    }
    return seconds >= kLongest ? std::chrono::nanoseconds::max()
                               : std::chrono::nanoseconds(std::llround(seconds * 1e9));
}

extern "C" {

static std::uint64_t runAfter(wl_delegate* self, double seconds, void (*block)(void*), void (*drop)(void*),
                              void* data) {
    try {
        const bool isKnown = visitPluginInstance(self, [](const PluginInstance&) {});
        return isKnown && block ? blocks().add({self, block, drop, data}, delayOf(seconds)) : 0;
    } catch (...) {
        return 0;
    }
}

static bool cancelBlock(wl_delegate* self, std::uint64_t number) {
    try {
        return blocks().cancel(self, number);
    } catch (...) {
        return false;
    }
}
}

} // namespace

const wl_dispatch& dispatchExtension() {
    static constexpr wl_dispatch extension{sizeof(wl_dispatch), runAfter, cancelBlock};
    return extension;
}

void setPluginMainLoop() {
    blocks().useLoop(platform::current().runLoops.current());
}

void dropBlocksOf(const wl_delegate* instance) {
    blocks().dropAllOf(instance);
}

} // namespace welcomer
