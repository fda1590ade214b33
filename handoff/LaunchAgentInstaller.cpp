#include "handoff/LaunchAgentInstaller.h"

#include "handoff/LaunchAgentFile.h"
#include "log/PCLogManager.h"
#include "platform/Platform.h"

#include <cerrno>
#include <optional>
#include <string>

namespace welcomer {

namespace {

// The user's home; throws where there is none. The platform makes the library folder in a new home, which is
// asked for its effect: here only the folder in it is made.
std::string homeWithLibrary() {
    platform::ProcessIdentity& identity = platform::current().processIdentity;
    identity.userLibraryDirectories();
    return identity.homeDirectory();
}

bool copyLaunchAgent(platform::ResourceBundle& bundle) {
    const platform::Platform& platform = platform::current();
    const std::optional<std::string> resource =
        bundle.pathForResource(kLaunchAgentLabel, kLaunchAgentFileType);
    const std::string home = homeWithLibrary();
    const std::string folder = launchAgentsFolder(home);
    if (!platform.fileSystem.exists(folder)) {
        const platform::Outcome created = platform.fileSystem.createDirectory(folder, 0755);
        if (!created && created.error.number != EEXIST) {
            WL_LOG("failed to create %@: %@", folder, created.error);
            return false;
        }
    }
    const platform::Outcome installed =
        resource ? platform.fileSystem.copy(*resource, launchAgentPath(home))
                 : platform::Outcome::failure({ENOENT, "the bundle has no launch-agent file"});
    if (!installed) {
        WL_LOG("failed to install com.corvid.welcomer.nimbussetup: %@", installed.error);
        return false;
    }
    return true;
}

} // namespace

bool installLaunchAgent(platform::ResourceBundle& bundle) {
    try {
        return copyLaunchAgent(bundle);
    } catch (const platform::Exception& exception) { // the user has no home
        WL_LOG("failed to install com.corvid.welcomer.nimbussetup: %@", exception);
        return false;
    }
}

} // namespace welcomer
