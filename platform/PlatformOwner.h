// A platform with everything it stands on, and what a program may choose of it.

#pragma once

#include "platform/BackendReport.h"
#include "platform/Platform.h"
#include "platform/SettingsReport.h"

#include <string>
#include <vector>

namespace welcomer {

namespace platform {
class AccountDirectory;
class SignInDirectory;
} // namespace platform

// What a program may choose.
struct PlatformOptions {
    // Every file of the system and the home folder are looked up below this folder.
    std::string root = "/";

    // Takes the records in place of the system log, or null. Borrowed: must outlive the platform.
    platform::SystemLog* systemLog = nullptr;

    // Each takes the place of the machine's own, or null. Borrowed: must outlive the platform.
    platform::Clock* clock = nullptr;
    platform::RunLoops* runLoops = nullptr;
    platform::DispatchQueues* dispatchQueues = nullptr;
    platform::HostReachability* hostReachability = nullptr;
    platform::SignInDirectory* signInDirectory = nullptr;

    // Below another root than "/", the address of the account server that signing in asks, as in the settings of a
    // machine; empty: none. A build without desktop backends asks none. With the root "/" the settings say it.
    std::string accountServer = {};

    // The folder of the application's main bundle, a path of this machine; empty: the application has none.
    std::string mainBundle = {};

    // New credentials go to the local store, whatever keyring there is. They are found either way.
    bool storesCredentialsLocally = false;
};

class PlatformOwner {
  public:
    virtual ~PlatformOwner() = default;

    // Borrowed: lives as long as this object.
    virtual const platform::Platform& platform() const = 0;

    // Who has an account here and who can sign in, for programs that try setup out: the system itself never
    // asks. Borrowed: lives as long as this object.
    virtual platform::AccountDirectory& accountDirectory() = 0;

    // Whom signing in asks. Borrowed: lives as long as this object.
    virtual platform::SignInDirectory& signInDirectory() = 0;

    // How the interfaces that have more than one backend are served now. Asks every service: may block.
    virtual std::vector<platform::BackendReport> backendReports() = 0;

    // The folder that plug-ins are found in now, in the place of platform::kPluginDirectory or that itself: a path
    // of the system, below the root.
    virtual std::string pluginFolder() const = 0;

    // What the backends themselves are set to, and where each value comes from. May read files.
    virtual platform::SettingsReport settings() = 0;
};

} // namespace welcomer
