// welcomer-resolver-sync, a system service: has the files in /etc/resolver take effect in systemd-resolved. It needs the
// right to administer the network, and that of its user to configure systemd-resolved.

#include "backends/Backends.h"
#include "log/PCLogManager.h"
#include "text/ProgramOptions.h"
#include "tools/resolver-sync/ResolverSync.h"
#include "tools/shared/RunningMark.h"

#include <exception>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

using namespace welcomer;

namespace {

// Removes the service's folder when nothing is in it any more.
struct FolderAtEnd {
    FolderAtEnd() = default;
    ~FolderAtEnd() { ::rmdir(resolver::kRuntimeFolder); }
    FolderAtEnd(const FolderAtEnd&) = delete;
    FolderAtEnd& operator=(const FolderAtEnd&) = delete;
};

} // namespace

int main(int argc, char** argv) {
    if (argc > 1) {
        return answerOption(argv[1], "welcomer-resolver-sync", "");
    }
    const auto owner = buildPlatform();
    const platform::ScopedPlatform installed(owner->platform());
    // Whoever starts it may have made the folder; what cannot be made shows when it is used.
    ::mkdir(resolver::kRuntimeFolder, 0755);
    try {
        const FolderAtEnd folder;
        resolver::RunningMark mark(resolver::kRunningMark);
        return resolver::ResolverSync("/etc/resolver", std::string(resolver::kRuntimeFolder) + "/forwarder",
                                      mark)
            .run();
    } catch (const std::exception& error) {
        WL_LOG("Failed to start: %@", std::string(error.what()));
        return 1;
    }
}
