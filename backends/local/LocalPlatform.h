// The platform on nothing but the kernel, the C library and files.

#pragma once

#include "backends/Backends.h"
#include "backends/local/LocalDirectoryService.h"
#include "backends/local/LocalFileSystem.h"
#include "backends/local/LocalNotificationCenter.h"
#include "backends/local/LocalPluginBundle.h"
#include "backends/local/LocalProcessIdentity.h"
#include "backends/local/LocalProcessLauncher.h"
#include "backends/local/LocalResourceBundles.h"
#include "backends/local/LocalSettings.h"
#include "backends/local/LocalSystemLog.h"
#include "backends/local/LocalSystemVersionInfo.h"
#include "backends/local/accounts/LocalAccountDirectory.h"
#include "backends/local/accounts/LocalAccountService.h"
#include "backends/local/credentials/LocalCredentialStore.h"
#include "backends/local/network/LocalHostReachability.h"
#include "backends/local/network/LocalNetworkConfigStore.h"
#include "backends/local/network/LocalNetworkStateStore.h"
#include "backends/local/preferences/LocalPreferenceStore.h"
#include "backends/local/time/LocalClock.h"
#include "backends/local/time/LocalDispatchQueues.h"
#include "backends/local/time/LocalRunLoops.h"
#include "backends/posix/RootFolder.h"

namespace welcomer::local {

// Making one costs no system call: every service does its work when it is first asked.
class LocalPlatform final : public PlatformOwner {
  public:
    explicit LocalPlatform(const PlatformOptions& options);

    const platform::Platform& platform() const override { return _platform; }
    platform::AccountDirectory& accountDirectory() override { return _accountDirectory; }
    platform::SignInDirectory& signInDirectory() override { return _signInDirectory; }
    std::vector<platform::BackendReport> backendReports() override;
    std::string pluginFolder() const override { return _pluginFolder.serving(); }
    platform::SettingsReport settings() override { return _settings.report(); }

    // The value of a setting, for the backends beside these; see LocalSettings.
    const std::string& setting(Setting setting) { return _settings.value(setting); }

    // What the system is called, or none; see LocalSystemVersionInfo.
    std::optional<std::string> productName() { return _systemVersionInfo.productName(); }

  private:
    const posix::RootFolder _root;
    LocalSystemLog _systemLog;
    LocalSettings _settings;
    const PluginFolder _pluginFolder{_root, [this] {
                                         return _settings.value(Setting::PluginFolder);
                                     }};
    LocalFileSystem _fileSystem{_root, _pluginFolder};
    LocalProcessIdentity _processIdentity{_root};
    // It complains to the machine's log, also where a program keeps its own lines for itself.
    LocalCredentialStore _credentialStore{_root, _processIdentity, &_systemLog};
    LocalPluginBundle _pluginBundle{_root, _pluginFolder};
    LocalResourceBundles _resourceBundles;
    LocalClock _clock;
    LocalRunLoops _runLoops;
    LocalDispatchQueues _dispatchQueues;
    LocalPreferenceStore _preferenceStore;
    LocalSystemVersionInfo _systemVersionInfo{_fileSystem};
    LocalHostReachability _hostReachability;
    LocalNotificationCenter _notificationCenter;
    NimbusDirectory _nimbusDirectory{_root};
    platform::SignInDirectory& _signInDirectory;
    LocalAccountService _accountService;
    LocalAccountDirectory _accountDirectory;
    LocalProcessLauncher _processLauncher;
    LocalNetworkConfigStore _networkConfigStore{_root};
    LocalNetworkStateStore _networkStateStore{_root};
    LocalDirectoryService _directoryService{_fileSystem};
    const platform::Platform _platform;
};

} // namespace welcomer::local
