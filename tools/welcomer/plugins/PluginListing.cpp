#include "tools/welcomer/plugins/PluginListing.h"

#include "platform/Platform.h"
#include "plugins/WLNimbusDelegatePlugins.h"
#include "tools/welcomer/story/AgentProcess.h"
#include "tools/welcomer/terminal/Failure.h"

#include <algorithm>
#include <chrono>
#include <csignal>
#include <cstring>
#include <map>
#include <optional>
#include <syslog.h>
#include <vector>

namespace welcomer::tool {

namespace {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

constexpr auto kLimit = 10s; // for one of them

class TooLong {};

std::string dumped(const Json& document) {
    return document.dump(-1, ' ', false, Json::error_handler_t::replace);
}

// By the files' names, what is the matter with those that a process has ended in.
using Culprits = std::map<std::string, std::string>;

// In a process of its own: each entry is named before it is loaded, and before it is given back.
ChildLife scanLife(const Culprits& culprits) {
    return [&culprits](const KeptLog&, const std::function<void(const std::string&)>& tell) {
        const auto begin = [&](const std::string& fileName) {
            tell(dumped({{"begins", fileName}}));
            return !culprits.contains(fileName);
        };
        std::vector<PluginScanEntry> entries = scanDelegatePlugins(begin);
        for (PluginScanEntry& entry : entries) {
            begin(entry.fileName);
            entry.plugin.reset();
            tell(dumped({{"file", entry.fileName},
                         {"identifier", entry.identifier ? Json(*entry.identifier) : Json()},
                         {"state", entry.reason.empty() ? kLoaded : entry.reason}}));
        }
        tell(dumped({{"finished", true}}));
        return EXIT_SUCCESS;
    };
}

std::string stateAfter(const std::optional<AgentEnd>& end) {
    if (!end) {
        return "it holds up the process for longer than " + std::to_string(kLimit.count()) + " s";
    }
    if (end->exitStatus) {
        return "it ends the process: exit(" + std::to_string(*end->exitStatus) + ")";
    }
    const char* const name = ::sigabbrev_np(end->signal);
    return "it ends the process: " + (name ? std::string("SIG") + name : end->description());
}

// One process's scan.
struct Scan {
    std::vector<std::string> order; // of what was met
    std::map<std::string, Json> records;
    std::vector<std::string> log;
    std::string last; // what it was at when it ended
    bool isFinished = false;

    void take(const Json& record) {
        if (record.contains("begins")) {
            last = record["begins"].get<std::string>();
            if (std::ranges::find(order, last) == order.end()) {
                order.push_back(last);
            }
        } else if (record.contains("file")) {
            records[record["file"].get<std::string>()] = record;
        } else {
            isFinished = true;
        }
    }
};

class Listing {
  public:
    Listing(const PlatformFactory& buildPlatform, const std::string& root, InterruptionGuard& guard)
        : _buildPlatform(buildPlatform),
          _root(root),
          _guard(guard) {}

    Json run() {
        for (;;) {
            Scan scan;
            const std::optional<AgentEnd> end = _scanOnce(scan);
            if (scan.isFinished) {
                return _resultOf(scan);
            }
            if (scan.last.empty() || _culprits.contains(scan.last)) {
                throw CommandFailure("the plug-ins cannot be looked at: " + stateAfter(end));
            }
            _culprits[scan.last] = stateAfter(end);
        }
    }

  private:
    std::optional<AgentEnd> _scanOnce(Scan& scan) {
        auto lastNews = Clock::now();
        AgentListener listener;
        listener.record = [&](const AgentLogRecord& record) {
            scan.log.push_back(record.message);
        };
        listener.told = [&](const std::string& text) {
            lastNews = Clock::now();
            scan.take(Json::parse(text, nullptr, false));
        };
        listener.tick = [&] {
            if (Clock::now() - lastNews > kLimit) {
                throw TooLong();
            }
        };
        try {
            return runChildProcess(_buildPlatform, _root, TimeKind::Real, _guard, listener,
                                   scanLife(_culprits));
        } catch (const TooLong&) {
            return std::nullopt;
        }
    }

    Json _resultOf(const Scan& scan) const {
        for (const std::string& line : scan.log) {
            platform::current().systemLog.write(LOG_NOTICE, line);
        }
        Json plugins = Json::array();
        for (const std::string& file : scan.order) {
            const auto culprit = _culprits.find(file);
            const bool isKnown = culprit == _culprits.end();
            plugins.push_back({{"identifier", isKnown ? scan.records.at(file)["identifier"] : Json()},
                               {"file", file},
                               {"state", isKnown ? scan.records.at(file)["state"] : Json(culprit->second)}});
        }
        return plugins;
    }

    const PlatformFactory& _buildPlatform;
    const std::string& _root;
    InterruptionGuard& _guard;
    Culprits _culprits;
};

} // namespace

Json listPlugins(const PlatformFactory& buildPlatform, const std::string& root, InterruptionGuard& guard) {
    return Listing(buildPlatform, root, guard).run();
}

} // namespace welcomer::tool
