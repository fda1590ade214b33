// welcomer, the tool: builds the platform from what this machine has and hands it over.

#include "backends/Backends.h"
#include "backends/simulated/VirtualTime.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/cli/ToolBundle.h"

namespace {

using namespace welcomer;
using simulated::VirtualTime;

// A platform with everything that it stands on.
struct OwnedPlatform {
    // Plug-ins do their work on real threads.
    std::unique_ptr<VirtualTime> simulatedTime;
    std::unique_ptr<PlatformOwner> owner;
};

tool::PlatformHandle build(const tool::PlatformRequest& request) {
    const auto owned = std::make_shared<OwnedPlatform>();
    PlatformOptions options{.root = request.root, .systemLog = request.systemLog};
    options.hostReachability = request.hostReachability;
    options.dispatchQueues = request.dispatchQueues;
    options.storesCredentialsLocally = request.storesCredentialsLocally;
    options.mainBundle = tool::findToolBundle();
    if (request.simulatedTime) {
        owned->simulatedTime = std::make_unique<VirtualTime>(VirtualTime::OutstandingWork::OnRealThreads);
        options.clock = owned->simulatedTime.get();
        options.runLoops = owned->simulatedTime.get();
        options.dispatchQueues = owned->simulatedTime.get();
    }
    owned->owner = buildPlatform(options);
    if (request.backendReports) {
        *request.backendReports = owned->owner->backendReports();
    }
    return {owned, &owned->owner->platform()};
}

} // namespace

int main(int argc, char** argv) {
    return tool::runTool(argc, argv, build);
}
