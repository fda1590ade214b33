// welcomer-launch-agents, started once or more at each login: starts the user's launch agents once.
//   --end-of-login   makes the next start a new login's
//   --help, --version

#include "backends/Backends.h"
#include "handoff/LaunchAgentFile.h"
#include "log/PCLogManager.h"
#include "text/ProgramOptions.h"
#include "tools/launch-agents/ChildStarter.h"
#include "tools/launch-agents/UserManagerStarter.h"
#include "tools/launch-agents/offerAgain.h"
#include "tools/launch-agents/startLaunchAgents.h"

#include <cstdlib>
#include <string_view>
#include <systemd/sd-daemon.h>
#include <utility>

using namespace welcomer;

namespace {

// Starts the launch agents that lie in the user's home, and stays with the agent of this system until it has
// ended.
//  result  the exit status
int startAgents(platform::ProcessIdentity& user, const std::string& runtimeFolder,
                const launch::LoginStamp& stamp) {
    try {
        const std::string home = user.homeDirectory();
        const std::string folder = launchAgentsFolder(home);
        launch::StartedAgents started = launch::startLaunchAgents(
            folder, user.effectiveUserID(), stamp, [&]() -> std::unique_ptr<launch::AgentStarter> {
                if (auto manager = launch::UserManagerStarter::connect(runtimeFolder)) {
                    return manager;
                }
                return std::make_unique<launch::ChildStarter>(home);
            });
        ::sd_notify(0, "READY=1"); // who waits for the login's agents to be started need wait no longer
        launch::offerAgain(folder, std::move(started));
        return 0;
    } catch (const platform::Exception& exception) { // there is no home
        WL_LOG("Launch agents cannot start: %@", exception);
        return 1;
    }
}

} // namespace

int main(int argc, char** argv) {
    const bool endOfLogin = argc == 2 && argv[1] == std::string_view("--end-of-login");
    if (argc > 1 && !endOfLogin) {
        return answerOption(argv[1], "welcomer-launch-agents", "[--end-of-login]");
    }
    const auto owner = buildPlatform();
    const platform::ScopedPlatform installed(owner->platform());
    const char* const variable = std::getenv("XDG_RUNTIME_DIR");
    const std::string runtimeFolder = variable ? variable : "";
    const launch::LoginStamp stamp(runtimeFolder);
    if (endOfLogin) {
        stamp.remove();
        return 0;
    }
    return startAgents(platform::current().processIdentity, runtimeFolder, stamp);
}
