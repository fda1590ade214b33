// welcomer-restore-network, run once when the machine starts: puts the stored network configuration to use. What cannot
// be used costs one line in the log, and the program then ends with 1.
//   --help, --version

#include "backends/Backends.h"
#include "backends/StoredNetwork.h"
#include "backends/bus/BusCall.h"
#include "log/PCLogManager.h"
#include "text/ProgramOptions.h"

#include <chrono>
#include <string>
#include <vector>

using namespace welcomer;

namespace {

constexpr bus::Peer kNetworkManager = {"org.freedesktop.NetworkManager", "/org/freedesktop/NetworkManager",
                                       "org.freedesktop.NetworkManager", std::chrono::seconds(10)};

bool networkManagerRuns() {
    const bus::Bus bus = bus::openSystemBus(kNetworkManager.limit);
    return bus && bus::isRunning(bus.get(), kNetworkManager);
}

} // namespace

int main(int argc, char** argv) {
    if (argc > 1) {
        return answerOption(argv[1], "welcomer-restore-network", "");
    }
    const auto owner = buildPlatform();
    const platform::ScopedPlatform installed(owner->platform());
    if (networkManagerRuns()) {
        return 0;
    }
    const std::vector<std::string> failures = restoreStoredNetwork();
    for (const std::string& failure : failures) {
        WL_LOG("Failed to use the stored network configuration of %@", failure);
    }
    return failures.empty() ? 0 : 1;
}
