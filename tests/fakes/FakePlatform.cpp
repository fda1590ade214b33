#include "tests/fakes/FakePlatform.h"

#include <type_traits>

namespace welcomer::fakes {

namespace {

template <class Interface>
Interface& chosen(Interface* instead, std::type_identity_t<Interface>& fake) {
    return instead ? *instead : fake;
}

} // namespace

FakePlatform::FakePlatform() : FakePlatform(Instead()) {}

FakePlatform::FakePlatform(const Instead& instead)
    : _platform{.systemLog = systemLog,
                .fileSystem = chosen(instead.fileSystem, fileSystem),
                .processIdentity = processIdentity,
                .credentialStore = credentialStore,
                .pluginBundle = chosen(instead.pluginBundle, pluginBundle),
                .resourceBundles = resourceBundles,
                .clock = virtualTime,
                .runLoops = chosen(instead.runLoops, virtualTime),
                .dispatchQueues = virtualTime,
                .preferenceStore = preferenceStore,
                .systemVersionInfo = systemVersionInfo,
                .hostReachability = hostReachability,
                .notificationCenter = notificationCenter,
                .accountService = accountService,
                .processLauncher = processLauncher,
                .networkConfigStore = networkConfigStore,
                .networkStateStore = networkStateStore,
                .directoryService = directoryService} {}

FakePlatform::~FakePlatform() = default;

} // namespace welcomer::fakes
