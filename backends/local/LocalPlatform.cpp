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
      _accountService(_root, _processIdentity, chosen(options.runLoops, _runLoops),
                      chosen(options.dispatchQueues, _dispatchQueues), _notificationCenter),
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

} // namespace welcomer::local
