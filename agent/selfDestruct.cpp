#include "agent/selfDestruct.h"

#include "handoff/LaunchAgentFile.h"
#include "log/PCLogManager.h"
#include "platform/Path.h"
#include "platform/Platform.h"
#include "text/Format.h"

#include <vector>

namespace welcomer {

namespace {

std::string userLibraryDirectory() {
    platform::ProcessIdentity& identity = platform::current().processIdentity;
    const std::vector<std::string> directories = identity.userLibraryDirectories();
    if (directories.empty()) {
        return platform::joinPath(identity.homeDirectory(), "Library");
    }
    const std::string& directory = directories.front();
    if (directory == "~") {
        return identity.homeDirectory();
    }
    if (directory.starts_with("~/")) {
        return platform::joinPath(identity.homeDirectory(), directory.substr(2));
    }
    return directory;
}

} // namespace

void selfDestruct(const std::string& label) {
    WL_LOG("Self destructing...");
    const std::string path = platform::joinPath(
        platform::joinPath(userLibraryDirectory(), kLaunchAgentsFolder), text::format("%@.plist", label));
    const platform::Platform& platform = platform::current();
    const platform::Outcome removed = platform.fileSystem.remove(path);
    if (!removed) {
        WL_LOG("Failed to remove wlnimbussetup plist for %@: %@", platform.processIdentity.loginName(),
               removed.error);
    }
}

} // namespace welcomer
