// welcomer, the tool: builds the platform from what this machine has and hands it over.

#include "backends/Backends.h"
#include "backends/simulated/VirtualTime.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/cli/ToolBundle.h"
#include "tools/welcomer/commands/Commands.h"

namespace {

using namespace welcomer;
using simulated::VirtualTime;

// A platform and the simulated time that it stands on.
struct SimulatedPlatform {
    // Plug-ins do their work on real threads.
    VirtualTime time{VirtualTime::OutstandingWork::OnRealThreads};
    std::unique_ptr<PlatformOwner> owner;
};

std::shared_ptr<PlatformOwner> build(PlatformOptions options, tool::TimeKind time) {
    options.mainBundle = tool::findToolBundle();
    if (time == tool::TimeKind::Real) {
        return buildPlatform(options);
    }
    const auto simulated = std::make_shared<SimulatedPlatform>();
    options.clock = &simulated->time;
    options.runLoops = &simulated->time;
    options.dispatchQueues = &simulated->time;
    simulated->owner = buildPlatform(options);
    return {simulated, simulated->owner.get()};
}

} // namespace

int main(int argc, char** argv) {
    return tool::runTool(argc, argv, build, tool::kCommands);
}
