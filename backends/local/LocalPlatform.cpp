#include "backends/local/LocalPlatform.h"

namespace welcomer::local {

LocalPlatform::LocalPlatform(const PlatformOptions& options)
    : _root(options.root),
      _platform{options.systemLog ? *options.systemLog : _systemLog,
                _fileSystem,
                _processIdentity,
                _credentialStore,
                _pluginBundle,
                _resourceBundles,
                _clock,
                _runLoops,
                _dispatchQueues,
                _preferenceStore,
                _systemVersionInfo,
                _hostReachability} {}

} // namespace welcomer::local
