#include "tools/welcomer/story/PluginTrial.h"

#include "agent/wlnimbussetup.h"
#include "agent/wlnimbussetup_RemainingDelegateSetup.h"
#include "handoff/ReplayItem.h"
#include "platform/AccountService.h"
#include "platform/Platform.h"
#include "plugins/PluginContext.h"
#include "plugins/PluginText.h"
#include "plugins/WLNimbusDelegatePlugins.h"
#include "text/Describe.h"
#include "tools/welcomer/login/LoginRecord.h"
#include "tools/welcomer/login/LoginReport.h"
#include "tools/welcomer/story/AgentProcess.h"
#include "tools/welcomer/story/FolderCopy.h"
#include "tools/welcomer/story/PluginCopy.h"
#include "tools/welcomer/story/ProcessTally.h"
#include "tools/welcomer/story/TemporaryFolder.h"
#include "tools/welcomer/terminal/Failure.h"

#include <algorithm>
#include <exception>
#include <utility>

namespace welcomer::tool {

namespace {

using namespace std::chrono_literals;
namespace fs = std::filesystem;

constexpr auto kLinger = 1s;

// Nobody waits any longer.
class TooLong {};

Json parsed(const std::string& text) {
    return Json::parse(text, nullptr, false);
}

std::string dumped(const Json& document) {
    return document.dump(-1, ' ', false, Json::error_handler_t::replace);
}

Json requestOf(WLFirstRunDelegateConfiguration& plugin, std::string& state) {
    try {
        const std::optional<PropertyList> request = plugin.delegateSetupRequest();
        return request ? toJson(*request) : Json();
    } catch (...) {
        state = "loaded, but its request raised: " + text::describe(std::current_exception());
        return {};
    }
}

// In a process of its own: what each plug-in says of itself before a login.
ChildLife scanLife(const std::string& account) {
    return [account](const KeptLog&, const std::function<void(const std::string&)>& tell) {
        setPluginAccount(account);
        Json plugins = Json::array();
        for (const PluginScanEntry& entry : scanDelegatePlugins()) {
            std::string state = entry.plugin ? "loaded" : entry.reason;
            const Json request = entry.plugin ? requestOf(*entry.plugin, state) : Json();
            plugins.push_back({{"file", entry.fileName},
                               {"state", state},
                               {"identifier", entry.identifier ? Json(*entry.identifier) : Json()},
                               {"request", request}});
        }
        tell(dumped(plugins));
        return EXIT_SUCCESS;
    };
}

Json namesOf(const std::vector<RunningTask>& tasks) {
    Json found = Json::array();
    for (const RunningTask& task : tasks) {
        found.push_back(task.name);
    }
    return found;
}

// In a process of its own: a login's second stage.
ChildLife completionLife(const std::string& account, const PropertyList& replayObject) {
    return [account, replayObject](const KeptLog&, const std::function<void(const std::string&)>& tell) {
        setPluginAccount(account);
        platform::current().runLoops.current();
        const ThreadTally threads;
        const auto group = platform::current().dispatchQueues.createGroup();
        wlnimbussetup_RemainingDelegateSetup(replayObject, std::nullopt, group);
        waitForDelegates(*group);
        linger(kLinger);
        tell(dumped({{"threads", threads.seen()},
                     {"leftRunning",
                      {{"threads", namesOf(threads.running())}, {"processes", namesOf(childProcesses())}}}}));
        return EXIT_SUCCESS;
    };
}

class Trial {
  public:
    Trial(const PlatformFactory& buildPlatform, const PluginTrialOptions& options, InterruptionGuard& guard)
        : _buildPlatform(buildPlatform),
          _options(options),
          _guard(guard) {}

    Json run() {
        _install();
        Json plugins = Json::array();
        const std::string scanEnd =
            _runChild(scanLife(_options.account), [&](const std::string& told) { plugins = parsed(told); });
        if (!plugins.is_array() || plugins.size() != _options.plugins.size()) {
            return {{"plugins", _unknown(scanEnd)},
                    {"threads", 0},
                    {"leftRunning", nullptr},
                    {"end", scanEnd},
                    {"log", _log}};
        }
        Json seen = {{"threads", 0}, {"leftRunning", nullptr}};
        const std::string end = _runChild(completionLife(_options.account, _replayObject(plugins)),
                                          [&](const std::string& told) { seen = parsed(told); });
        for (Json& plugin : plugins) {
            _addOutcome(plugin, end);
        }
        return {{"plugins", plugins},
                {"threads", seen["threads"]},
                {"leftRunning", seen["leftRunning"]},
                {"end", end},
                {"log", _log}};
    }

  private:
    // The made-up machine: a home folder, and the plug-ins.
    void _install() {
        const auto owner = _buildPlatform({.root = _root()}, TimeKind::Real);
        makeFolders(_folder.path() /
                    fs::path(owner->platform().processIdentity.homeDirectory()).relative_path());
        const fs::path folder = _folder.path() / fs::path(kPluginDirectory).relative_path();
        makeFolders(folder);
        for (const fs::path& plugin : _options.plugins) {
            installPlugin(plugin, folder);
        }
    }

    std::string _root() const { return _folder.path().string(); }

    // Runs one of the processes, whose log is kept from its beginning.
    //  result  how it ended
    std::string _runChild(const ChildLife& life, const std::function<void(const std::string&)>& told) {
        _log = Json::array();
        _record = LoginRecord();
        const auto start = std::chrono::steady_clock::now();
        AgentListener listener;
        listener.record = [&](const AgentLogRecord& record) {
            _record.read(record.time, record.message);
            _log.push_back({{"seconds", std::chrono::duration<double>(record.time).count()},
                            {"message", record.message}});
        };
        listener.told = told;
        listener.tick = [&] {
            if (std::chrono::steady_clock::now() - start > _options.limit) {
                throw TooLong();
            }
        };
        try {
            return runChildProcess(_buildPlatform, _root(), TimeKind::Real, _guard, listener, life)
                .description();
        } catch (const TooLong&) {
            return "the limit of " + std::to_string(_options.limit.count()) + " s";
        }
    }

    // What there is to say of plug-ins that have ended the process which loaded them.
    Json _unknown(const std::string& end) const {
        Json plugins = Json::array();
        for (const fs::path& plugin : _options.plugins) {
            plugins.push_back({{"file", plugin.filename().string()},
                               {"state", "it ended the process that loaded it"},
                               {"outcome", "not loaded"},
                               {"message", end}});
        }
        return plugins;
    }

    PropertyList _replayObject(const Json& plugins) const {
        PropertyList::Dictionary responses;
        for (const Json& plugin : plugins) {
            if (plugin["identifier"].is_string()) {
                responses[plugin["identifier"].get<std::string>()] = _options.response;
            }
        }
        PropertyList::Dictionary replay{
            {kReplayResponsesKey, PropertyList::Dictionary{{platform::kDelegatesKey, responses}}}};
        if (_options.aliases) {
            for (const char* key : {kReplayVidlinkAliasesKey, kReplayChatterAliasesKey}) {
                replay[key] = PropertyList::Array(_options.aliases->begin(), _options.aliases->end());
            }
        }
        return replay;
    }

    void _addOutcome(Json& plugin, const std::string& end) const {
        plugin["response"] = toJson(_options.response);
        const Json delegates = toJson(_record, false)["delegates"];
        const auto found = std::ranges::find_if(delegates, [&](const Json& delegate) {
            return plugin["identifier"].is_string() &&
                   delegate["identifier"] == pluginText(plugin["identifier"].get<std::string>());
        });
        if (found == delegates.end()) {
            plugin["outcome"] = "not loaded";
            plugin["message"] = plugin["state"];
            return;
        }
        const bool hasAnswered = (*found)["outcome"] != "never-answered";
        plugin["outcome"] = (*found)["outcome"];
        plugin["message"] = hasAnswered ? (*found)["reason"] : Json("the agent ended with " + end);
        plugin["progress"] = (*found)["progress"];
        plugin["seconds"] = (*found)["seconds"];
    }

    const PlatformFactory& _buildPlatform;
    const PluginTrialOptions& _options;
    InterruptionGuard& _guard;
    const TemporaryFolder _folder;
    Json _log;
    LoginRecord _record;
};

} // namespace

Json tryPlugins(const PlatformFactory& buildPlatform, const PluginTrialOptions& options,
                InterruptionGuard& guard) {
    return Trial(buildPlatform, options, guard).run();
}

bool haveCompleted(const Json& trial) {
    return std::ranges::all_of(trial["plugins"],
                               [](const Json& plugin) { return plugin.value("outcome", "") == "completed"; });
}

} // namespace welcomer::tool
