// How the tool gets a platform: main.cpp, which knows the backends, hands this to everything else.

#pragma once

#include "platform/BackendReport.h"
#include "platform/Platform.h"

#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace welcomer::tool {

struct PlatformRequest {
    std::string root = "/"; // every path of the system is looked up below it
    platform::SystemLog* systemLog =
        nullptr;                // takes the records in place of the system log, or null; borrowed
    bool simulatedTime = false; // clock, run loops and queues on simulated time
    platform::HostReachability* hostReachability =
        nullptr;                                        // in place of the machine's own, or null; borrowed
    platform::DispatchQueues* dispatchQueues = nullptr; // the same; not with simulated time
    bool storesCredentialsLocally = false; // new credentials go to the local store, whatever keyring there is
    // Where to put how each interface is served, or null; asks the services, and may block. Borrowed.
    std::vector<platform::BackendReport>* backendReports = nullptr;
};

// A platform together with what owns it.
using PlatformHandle = std::shared_ptr<const platform::Platform>;

// Builds a platform; opens nothing and starts no thread.
using PlatformFactory = std::function<PlatformHandle(const PlatformRequest&)>;

} // namespace welcomer::tool
