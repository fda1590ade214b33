#include "agent/wlnimbussetup.h"

#include "agent/selfDestruct.h"
#include "agent/wlnimbussetup_RemainingDelegateSetup.h"
#include "agent/wlnimbussetup_RemainingSkylarkSetup.h"
#include "handoff/LaunchAgentFile.h"
#include "handoff/ReplayItem.h"
#include "log/PCLogManager.h"
#include "platform/Platform.h"
#include "plugins/PluginContext.h"

#include <chrono>
#include <exception>
#include <memory>
#include <string>

namespace welcomer {

namespace {

using namespace std::chrono_literals;

// Carries out one step. What gets out of it, which only a lack of memory or of threads should, keeps no later
// step from its work, nor does a line that cannot be written then.
template <class Step>
void attempt(const Step& step) {
    try {
        step();
    } catch (...) {
        const std::exception_ptr exception = std::current_exception();
        try {
            WL_LOG("exception in wlnimbussetup: %@", exception);
        } catch (...) {
            // Without its line, then.
        }
    }
}

void finishSetup(const std::string& label) {
    attempt([&] { selfDestruct(label); });
    const std::shared_ptr<platform::WorkGroup> group = platform::current().dispatchQueues.createGroup();
    ReplayItem replay;
    if (!WLGetNimbusReplayKeychainItem(replay)) {
        return;
    }
    // Before any use of its contents, so that a crash never replays it twice.
    attempt([&] { WLDeleteNimbusReplayKeychainItem(replay); });
    attempt([&] { setPluginAccount(replay.item.label); });
    attempt([&] { wlnimbussetup_RemainingSkylarkSetup(replay.item.label, group); });
    attempt([&] { wlnimbussetup_RemainingDelegateSetup(replay.replayObject, std::nullopt, group); });
    replay.replayObject = PropertyList(); // may be large, and each plug-in's job holds what it needs of it
    attempt([&] { waitForDelegates(*group); });
    attempt([] {
        WL_LOG("delaying exit by two minutes");
        linger(120s);
    });
}

} // namespace

// The run loop's slices keep alive what plug-ins schedule on the main thread.
void waitForDelegates(platform::WorkGroup& group) {
    while (!group.wait(100ms)) {
        attempt([] { platform::current().runLoops.current()->run(1s); });
    }
}

// The port keeps the run loop from returning at once.
void linger(std::chrono::nanoseconds duration) {
    const auto runLoop = platform::current().runLoops.current();
    const auto port = runLoop->attachPort();
    runLoop->run(duration);
}

int wlnimbussetup(int argc, const char* const* argv) {
    try {
        attempt([&] { finishSetup(argc >= 2 ? argv[1] : kLaunchAgentLabel); });
        WL_LOG(kAgentExitingMessage);
    } catch (...) {
        // What cannot even be logged does not change how the agent ends.
    }
    return 0;
}

} // namespace welcomer
