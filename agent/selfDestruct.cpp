#include "agent/selfDestruct.h"

#include "handoff/LaunchAgentFile.h"
#include "log/PCLogManager.h"
#include "platform/Path.h"
#include "platform/Platform.h"

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

platform::Outcome removeLaunchAgentFile(const std::string& label) {
    try {
        const std::string folder = platform::joinPath(userLibraryDirectory(), kLaunchAgentsFolder);
        return platform::current().fileSystem.remove(platform::joinPath(folder, launchAgentFileName(label)));
    } catch (const platform::Exception& exception) { // the user has no home
        return platform::Outcome::failure({0, exception.what()});
    }
}

} // namespace

void selfDestruct(const std::string& label) {
    WL_LOG("Self destructing...");
    const platform::Outcome removed = removeLaunchAgentFile(label);
    if (!removed) {
        WL_LOG("Failed to remove wlnimbussetup plist for %@: %@",
               platform::current().processIdentity.loginName(), removed.error);
    }
}

} // namespace welcomer
