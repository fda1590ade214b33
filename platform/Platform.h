// All of the operating system's services in one place.

#pragma once

#include "platform/AccountService.h"
#include "platform/Clock.h"
#include "platform/CredentialStore.h"
#include "platform/DirectoryService.h"
#include "platform/DispatchQueue.h"
#include "platform/FileSystem.h"
#include "platform/HostReachability.h"
#include "platform/NetworkConfigStore.h"
#include "platform/NetworkStateStore.h"
#include "platform/NotificationCenter.h"
#include "platform/PluginBundle.h"
#include "platform/PreferenceStore.h"
#include "platform/ProcessIdentity.h"
#include "platform/ProcessLauncher.h"
#include "platform/ResourceBundle.h"
#include "platform/RunLoop.h"
#include "platform/SystemLog.h"
#include "platform/SystemVersionInfo.h"

namespace welcomer::platform {

// References to the services that the system runs on; a backend owns them. Built by names: the compiler
// refuses a platform that lacks one.
struct Platform {
    SystemLog& systemLog;
    FileSystem& fileSystem;
    ProcessIdentity& processIdentity;
    CredentialStore& credentialStore;
    PluginBundle& pluginBundle;
    ResourceBundles& resourceBundles;
    Clock& clock;
    RunLoops& runLoops;
    DispatchQueues& dispatchQueues;
    PreferenceStore& preferenceStore;
    SystemVersionInfo& systemVersionInfo;
    HostReachability& hostReachability;
    NotificationCenter& notificationCenter;
    AccountService& accountService;
    ProcessLauncher& processLauncher;
    NetworkConfigStore& networkConfigStore;
    NetworkStateStore& networkStateStore;
    DirectoryService& directoryService;
};

// The installed platform. A program installs one at its start, before anything else of the system is called,
// and keeps it until it ends: without one, this ends the process with a line that says so. Any thread.
const Platform& current();

// Installs a platform for the lifetime of this object and puts back the one before. It borrows the platform,
// which must outlive it and everything that still runs on other threads. Main thread.
class ScopedPlatform {
  public:
    explicit ScopedPlatform(const Platform& platform);
    ~ScopedPlatform();
    ScopedPlatform(const ScopedPlatform&) = delete;
    ScopedPlatform& operator=(const ScopedPlatform&) = delete;

  private:
    const Platform* _previous;
};

} // namespace welcomer::platform
