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
      _settings(_root, chosen(options.systemLog, _systemLog)),
      _resourceBundles(_root, options.mainBundle),
      _preferenceStore(_root, _processIdentity, chosen(options.systemLog, _systemLog)),
      _signInDirectory(chosen(options.signInDirectory, _nimbusDirectory)),
      _accountService(_root, _processIdentity, chosen(options.runLoops, _runLoops),
                      chosen(options.dispatchQueues, _dispatchQueues), _notificationCenter,
                      chosen(options.systemLog, _systemLog), &_signInDirectory),
      _accountDirectory(_root, _processIdentity, chosen(options.systemLog, _systemLog), &_signInDirectory),
      _platform{.systemLog = chosen(options.systemLog, _systemLog),
                .fileSystem = _fileSystem,
                .processIdentity = _processIdentity,
                .credentialStore = _credentialStore,
                .pluginBundle = _pluginBundle,
                .resourceBundles = _resourceBundles,
                .clock = chosen(options.clock, _clock),
                .runLoops = chosen(options.runLoops, _runLoops),
                .dispatchQueues = chosen(options.dispatchQueues, _dispatchQueues),
                .preferenceStore = _preferenceStore,
                .systemVersionInfo = _systemVersionInfo,
                .hostReachability = chosen(options.hostReachability, _hostReachability),
                .notificationCenter = _notificationCenter,
                .accountService = _accountService,
                .processLauncher = _processLauncher,
                .networkConfigStore = _networkConfigStore,
                .networkStateStore = _networkStateStore,
                .directoryService = _directoryService} {}

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
