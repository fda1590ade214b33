// Runs the system's own code in a child process, as a setup or a login would, and listens to its log.

#pragma once

#include "tools/welcomer/cli/KeptLog.h"
#include "tools/welcomer/cli/PlatformFactory.h"
#include "tools/welcomer/terminal/InterruptionGuard.h"

#include <chrono>
#include <functional>
#include <optional>
#include <string>

namespace welcomer::tool {

// One record of the child's log.
struct AgentLogRecord {
    std::chrono::nanoseconds time; // since the child's start, on the child's own clock
    std::string message;
};

// Who listens to the child. Called on the thread that runs it.
struct AgentListener {
    std::function<void(const AgentLogRecord&)> record;
    std::function<void()> tick;                   // about every 200 ms while the child runs, or null
    std::function<void(const std::string&)> told; // what the child tells besides its log, or null
};

// What a child process does, with its platform installed; its result is the exit status. It must not throw.
//  log   the child's own system log so far
//  tell  hands a text to the parent
using ChildLife =
    std::function<int(const KeptLog& log, const std::function<void(const std::string& text)>& tell)>;

// How the child process ended.
struct AgentEnd {
    std::optional<int> exitStatus; // none when a signal ended it
    int signal = 0;

    bool succeeded() const { return exitStatus == 0; }
    std::string description() const; // "status 0", "signal 11 (Segmentation fault)"
};

// Runs a child process and waits for its end. The child's standard output goes to stderr.
//  root  the folder below which the child looks up everything
//  time  what the child runs on
//  runLoops  in the place of those that a platform below that folder has, which know nothing of the desktop's; null for
//            those
// Main thread, no other thread running. Throws CommandFailure when no process can be made, and Interrupted.
AgentEnd runChildProcess(const PlatformFactory& buildPlatform, const std::string& root, TimeKind time,
                         InterruptionGuard& guard, const AgentListener& listener, const ChildLife& life,
                         platform::RunLoops* runLoops = nullptr);

// The same, with the agent as it is at a login.
AgentEnd runAgentProcess(const PlatformFactory& buildPlatform, const std::string& root, TimeKind time,
                         InterruptionGuard& guard, const AgentListener& listener);

} // namespace welcomer::tool
