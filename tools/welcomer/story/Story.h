// The whole story: a machine is made below a folder, a user is set up on it, and logs in twice.

#pragma once

#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/story/AgentProcess.h"
#include "tools/welcomer/story/DelegateReport.h"
#include "tools/welcomer/story/ServiceStates.h"
#include "tools/welcomer/terminal/ProgressLine.h"

#include <chrono>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::tool {

class Story {
  public:
    //  session    whose reader is told what goes on; borrowed, like the guard
    //  timeLapse  the agent runs on simulated time
    //  root       the folder of the machine
    Story(Session& session, bool timeLapse, const std::filesystem::path& root, InterruptionGuard& guard);

    // Tells it while it goes on.
    //  result  the document, with a failure where a login did not do its part
    // Throws CommandFailure where it cannot go on, and Interrupted. Main thread, no other thread running.
    Report tell();

  private:
    // The setup, as it was seen from outside.
    struct Setup {
        std::vector<AgentLogRecord> log;
        Json result;
        Json services; // afterwards
    };
    // One login, as it was seen from outside.
    struct Login {
        std::vector<AgentLogRecord> log;
        DelegateReport report;
        AgentEnd end;
        std::chrono::steady_clock::time_point started = std::chrono::steady_clock::now();
        std::optional<std::chrono::steady_clock::time_point> lingering; // since when
    };
    // What a login left on disk.
    struct LeftOnDisk {
        bool launchAgent = false;
        bool replayItem = false;
        std::vector<ServiceState> services;
        std::vector<std::string> files; // in the home folder, relative to it
    };

    void _say(const std::string& line);
    void _sayWhatIsPrepared(std::size_t plugins);
    void _showRecord(const AgentLogRecord& record);
    void _showServices(const Json& services);
    void _showDelegates(const DelegateReport& report);
    void _showProgress(ProgressLine& progress, const Login& login) const;

    std::filesystem::path _below(const std::filesystem::path& path) const;
    std::string _launchAgentPath() const;
    std::vector<ServiceState> _services() const;

    void _prepare();
    Setup _setUp();
    Login _login();
    LeftOnDisk _look();

    static Json _asJson(const std::vector<AgentLogRecord>& records);
    static Json _asJson(const Login& login);
    static std::optional<std::string> _failure(const Login& first, const Login& second,
                                               const LeftOnDisk& left,
                                               const std::vector<std::string>& changes);

    Session& _session;
    const bool _timeLapse;
    const std::filesystem::path _root;
    InterruptionGuard& _guard;
    KeptLog _log;
    const std::shared_ptr<PlatformOwner> _owner;
    const platform::ScopedPlatform _installed;
    const std::string _home;
    std::string _password; // of the story's user
};

} // namespace welcomer::tool
