// wlnimbussetup, the program that the launch agent starts once, at the user's first login after setup.

#include "agent/leaveProcess.h"
#include "agent/wlnimbussetup.h"
#include "backends/Backends.h"

int main(int argc, char** argv) {
    try {
        const auto owner = welcomer::buildPlatform();
        const welcomer::platform::ScopedPlatform installed(owner->platform());
        welcomer::leaveProcess(welcomer::wlnimbussetup(argc, argv));
    } catch (...) {
        // Without a platform there is no log to write to either; nothing changes how the agent ends.
        return 0;
    }
}
