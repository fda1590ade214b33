// wlnimbussetup, the program that the launch agent starts once, at the user's first login after setup.

#include "agent/leaveProcess.h"
#include "agent/wlnimbussetup.h"
#include "backends/Backends.h"
#include "backends/UnexpectedEnd.h"
#include "log/PCLogManager.h"
#include "plugins/PluginMark.h"
#include "text/ProgramOptions.h"

#include <string_view>

int main(int argc, char** argv) {
    if (argc >= 2 && std::string_view(argv[1]).starts_with("--")) {
        welcomer::answerOption(argv[1], "wlnimbussetup", "[LABEL]");
        return 0;
    }
    welcomer::reportUnexpectedEnd({welcomer::PCLogManager::kPriorityNormal, welcomer::PluginMark::current});
    try {
        const auto owner = welcomer::buildPlatform();
        const welcomer::platform::ScopedPlatform installed(owner->platform());
        welcomer::leaveProcess(welcomer::wlnimbussetup(argc, argv));
    } catch (...) {
        // Without a platform there is no log to write to either; nothing changes how the agent ends.
        welcomer::leaveProcess(0);
    }
}
