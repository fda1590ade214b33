// welcomer-resolver-sync, a system service: has the files in /etc/resolver take effect in systemd-resolved.

#include "backends/Backends.h"
#include "log/PCLogManager.h"
#include "text/ProgramOptions.h"
#include "tools/resolver-sync/ResolverSync.h"
#include "tools/shared/RunningMark.h"

#include <exception>
#include <string>

using namespace welcomer;

int main(int argc, char** argv) {
    if (argc > 1) {
        return answerOption(argv[1], "welcomer-resolver-sync", "");
    }
    const auto owner = buildPlatform();
    const platform::ScopedPlatform installed(owner->platform());
    try {
        resolver::RunningMark mark(resolver::kRunningMark);
        return resolver::ResolverSync("/etc/resolver", "/run/welcomer-resolver-sync", mark).run();
    } catch (const std::exception& error) {
        WL_LOG("Failed to start: %@", std::string(error.what()));
        return 1;
    }
}
