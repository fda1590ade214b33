#include "tools/welcomer/plugins/PluginLife.h"

#include "platform/Platform.h"
#include "plugins/HostExtensions.h"
#include "tools/welcomer/plugins/CheckingHost.h"

#include <atomic>
#include <future>
#include <thread>

namespace welcomer::tool {

namespace {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

constexpr auto kSlice = 2ms; // of the main loop
constexpr auto kPatience = 2s;
constexpr auto kBeforeTermination = 10ms;

void runMainLoopFor(std::chrono::milliseconds duration) {
    const auto end = Clock::now() + duration;
    runMainLoopUntil([&] { return Clock::now() >= end; });
}

// The thread that asks for a completion.
class Caller {
  public:
    Caller(CheckedPlugin& plugin, const Completion& completion)
        : _thread([this, &plugin, &completion, mayEnd = _mayEnd.get_future()] {
              const SetAtEnd returned{_hasReturned};
              _end =
                  plugin.complete(completion.response, completion.aliases ? &*completion.aliases : nullptr);
              returned.set();
              if (!completion.callerEnds) {
                  mayEnd.wait();
              }
          }) {}
    ~Caller() {
        _mayEnd.set_value();
        if (_thread.joinable()) {
            _thread.join();
        }
    }
    Caller(const Caller&) = delete;
    Caller& operator=(const Caller&) = delete;

    bool hasReturned() const { return _hasReturned; }
    void waitForItsEnd() { _thread.join(); }
    const CallEnd& end() const { return _end; } // once it has returned

  private:
    // Says so also when the plug-in has ended the thread.
    struct SetAtEnd {
        std::atomic<bool>& flag;
        void set() const { flag = true; }
        ~SetAtEnd() { set(); }
    };

    std::promise<void> _mayEnd;
    std::atomic<bool> _hasReturned{false};
    CallEnd _end;
    std::thread _thread; // last: it uses the others
};

} // namespace

void runMainLoopUntil(const std::function<bool()>& isSo) {
    const auto loop = platform::current().runLoops.current();
    const auto port = loop->attachPort();
    while (!isSo()) {
        loop->run(kSlice);
    }
}

bool beginLife(CheckedPlugin& plugin) {
    platform::current().runLoops.current(); // before there is a plug-in that could take what it stands on
    setPluginMainLoop();
    if (!plugin.load().empty() || !plugin.create(checkingHost()) || !plugin.identifier()) {
        return false;
    }
    plugin.request();
    return true;
}

CallEnd completeLife(CheckedPlugin& plugin, CheckReport& report, const Completion& completion) {
    Caller caller(plugin, completion);
    if (completion.isTerminated) {
        runMainLoopFor(kBeforeTermination);
        plugin.terminate();
    }
    runMainLoopUntil([&] { return caller.hasReturned(); });
    if (completion.callerEnds) {
        caller.waitForItsEnd();
    }
    CallEnd end = caller.end();
    if (!end.raised && !end.thrown && !plugin.hasEndedThread()) {
        report.step("waiting for its answer");
        const auto patienceEnds = Clock::now() + completion.patience.value_or(24h);
        runMainLoopUntil(
            [&] { return !CheckedHandler::instance().calls().empty() || Clock::now() >= patienceEnds; });
    }
    report.step("waiting after its answer");
    runMainLoopFor(completion.watched);
    if (plugin.afterCall) {
        plugin.afterCall("its answer");
    }
    return end;
}

void liveLife(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    if (beginLife(plugin)) {
        completeLife(plugin, report, {.response = input.response, .patience = kPatience});
    }
}

} // namespace welcomer::tool
