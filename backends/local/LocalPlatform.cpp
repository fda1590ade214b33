#include "backends/local/LocalPlatform.h"

#include <type_traits>

namespace welcomer::local {

namespace {

// What a program has put in a service's place, or the service.
template <class Interface>
Interface& chosen(Interface* replacement, std::type_identity_t<Interface>& service) {
    return replacement ? *replacement : service;
}

} // namespace

LocalPlatform::LocalPlatform(const PlatformOptions& options)
    : _root(options.root),
      _resourceBundles(_root, options.mainBundle),
      _preferenceStore(_root, _processIdentity, chosen(options.systemLog, _systemLog)),
      _accountService(_root, _processIdentity, chosen(options.runLoops, _runLoops),
                      chosen(options.dispatchQueues, _dispatchQueues), _notificationCenter,
                      chosen(options.systemLog, _systemLog)),
      _accountDirectory(_root, _processIdentity, chosen(options.systemLog, _systemLog)),
      _platform{chosen(options.systemLog, _systemLog),
                _fileSystem,
                _processIdentity,
                _credentialStore,
                _pluginBundle,
                _resourceBundles,
                chosen(options.clock, _clock),
                chosen(options.runLoops, _runLoops),
                chosen(options.dispatchQueues, _dispatchQueues),
                _preferenceStore,
                _systemVersionInfo,
                chosen(options.hostReachability, _hostReachability),
                _notificationCenter,
                _accountService,
                _accountDirectory,
                _processLauncher,
                _networkConfigStore,
                _networkStateStore,
                _directoryService} {}

std::vector<platform::BackendReport> LocalPlatform::backendReports() {
    const bool isWholeMachine = _root.isWholeMachine();
    const std::string reason =
        isWholeMachine ? "this build has no desktop backends" : "the desktop's services know no root but /";
    const std::string advice = isWholeMachine ? "build with WELCOMER_DESKTOP" : "";
    return {
        {"CredentialStore", "local file", reason, advice}, {"PreferenceStore", "files", reason, advice},
        {"RunLoop", "standard threads", reason, advice},   {"AccountService", "account file", reason, advice},
        {"NetworkConfigStore", "file", reason, advice},    {"NetworkStateStore", "kernel", reason, advice},
        {"HostReachability", "kernel", reason, advice}};
}

} // namespace welcomer::local
