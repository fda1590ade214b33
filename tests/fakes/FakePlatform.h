// All of the platform in memory, on simulated time.

#pragma once

#include "platform/Platform.h"
#include "tests/fakes/CallRecorder.h"
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
#include "tests/fakes/RecordedTime.h"

namespace welcomer::fakes {

// A test makes one, sets up its members and installs it:
//     FakePlatform fake;
//     const platform::ScopedPlatform installed(fake.platform());
class FakePlatform {
  public:
    // What stands in a fake's place, each null or borrowed.
    struct Instead {
        platform::FileSystem* fileSystem = nullptr;
        platform::PluginBundle* pluginBundle = nullptr;
        platform::RunLoops* runLoops = nullptr;
    };

    // Not where they are declared: making and ending all of the fakes was the greater part of compiling a test.
    FakePlatform();
    explicit FakePlatform(const Instead& instead);
    ~FakePlatform();
    FakePlatform(const FakePlatform&) = delete;
    FakePlatform& operator=(const FakePlatform&) = delete;

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
    RecordedTime virtualTime; // the clock, the run loops and the queues
    FakeNotificationCenter notificationCenter;
    FakeAccountService accountService{recorder, notificationCenter, virtualTime, virtualTime};
    FakeProcessLauncher processLauncher{recorder};
    FakeNetworkConfigStore networkConfigStore{recorder};
    FakeNetworkStateStore networkStateStore{recorder};
    FakeDirectoryService directoryService{recorder};

    // Borrowed: lives as long as this object.
    const platform::Platform& platform() const { return _platform; }

  private:
    const platform::Platform _platform;
};

} // namespace welcomer::fakes
