// All of the platform in memory, on simulated time.

#pragma once

#include "backends/simulated/VirtualTime.h"
#include "platform/Platform.h"
#include "tests/fakes/CallRecorder.h"
#include "tests/fakes/FakeAccountDirectory.h"
#include "tests/fakes/FakeAccountService.h"
#include "tests/fakes/FakeCredentialStore.h"
#include "tests/fakes/FakeDirectoryService.h"
#include "tests/fakes/FakeFileSystem.h"
#include "tests/fakes/FakeHostReachability.h"
#include "tests/fakes/FakeNetworkConfigStore.h"
#include "tests/fakes/FakeNetworkStateStore.h"
#include "tests/fakes/FakeNotificationCenter.h"
#include "tests/fakes/FakePluginBundle.h"
#include "tests/fakes/FakePreferenceStore.h"
#include "tests/fakes/FakeProcessIdentity.h"
#include "tests/fakes/FakeProcessLauncher.h"
#include "tests/fakes/FakeResourceBundles.h"
#include "tests/fakes/FakeSystemLog.h"
#include "tests/fakes/FakeSystemVersionInfo.h"

namespace welcomer::fakes {

// A test makes one, sets up its members and installs it:
//     FakePlatform fake;
//     const platform::ScopedPlatform installed(fake.platform());
class FakePlatform {
  public:
    FakePlatform() = default;

    // The same, but with other files than the fake ones; borrowed.
    explicit FakePlatform(platform::FileSystem& otherFiles) : _files(otherFiles) {}

    // The same, and with other plug-in bundles too.
    FakePlatform(platform::FileSystem& otherFiles, platform::PluginBundle& otherPlugins)
        : _files(otherFiles),
          _plugins(otherPlugins) {}

    // Every call to any of the fakes, in order.
    CallRecorder recorder;

    FakeSystemLog systemLog{recorder};
    FakeFileSystem fileSystem{recorder};
    FakeProcessIdentity processIdentity{recorder, fileSystem};
    FakeCredentialStore credentialStore{recorder};
    FakePluginBundle pluginBundle{recorder};
    FakeResourceBundles resourceBundles{recorder};
    FakePreferenceStore preferenceStore{recorder};
    FakeSystemVersionInfo systemVersionInfo{recorder};
    FakeHostReachability hostReachability{recorder};
    simulated::VirtualTime virtualTime; // the clock, the run loops and the queues
    FakeNotificationCenter notificationCenter;
    FakeAccountService accountService{recorder, notificationCenter, virtualTime, virtualTime};
    FakeAccountDirectory accountDirectory{accountService};
    FakeProcessLauncher processLauncher{recorder};
    FakeNetworkConfigStore networkConfigStore{recorder};
    FakeNetworkStateStore networkStateStore{recorder};
    FakeDirectoryService directoryService{recorder};

    // Borrowed: lives as long as this object.
    const platform::Platform& platform() const { return _platform; }

  private:
    platform::FileSystem& _files = fileSystem;
    platform::PluginBundle& _plugins = pluginBundle;
    platform::Platform _platform{systemLog,          _files,
                                 processIdentity,    credentialStore,
                                 _plugins,           resourceBundles,
                                 virtualTime,        virtualTime,
                                 virtualTime,        preferenceStore,
                                 systemVersionInfo,  hostReachability,
                                 notificationCenter, accountService,
                                 accountDirectory,   processLauncher,
                                 networkConfigStore, networkStateStore,
                                 directoryService};
};

} // namespace welcomer::fakes
