#include "tools/welcomer/story/Story.h"
#include "tools/welcomer/story/SetupBundle.h"

#include "backends/accountserver/Protocol.h"
#include "handoff/LaunchAgentFile.h"
#include "handoff/ReplayItem.h"
#include "plugins/WLNimbusDelegatePlugins.h"
#include "tools/welcomer/login/AgentTexts.h"
#include "tools/welcomer/login/LoginRecord.h"
#include "tools/welcomer/login/LoginReport.h"
#include "tools/welcomer/story/AgentProcess.h"
#include "tools/welcomer/story/ExampleFiles.h"
#include "tools/welcomer/story/ExampleServer.h"
#include "tools/welcomer/story/ExampleSetup.h"
#include "tools/welcomer/story/FolderCopy.h"
#include "tools/welcomer/story/FolderSnapshot.h"
#include "tools/welcomer/story/PluginCopy.h"
#include "tools/welcomer/story/ServiceStates.h"
#include "tools/welcomer/story/SetupFlow.h"
#include "tools/welcomer/terminal/ProgressLine.h"

#include <chrono>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace welcomer::tool {

namespace {

namespace fs = std::filesystem;

constexpr std::chrono::seconds kLinger{120};

std::string wholeSeconds(std::chrono::nanoseconds duration) {
    return std::to_string(std::chrono::duration_cast<std::chrono::seconds>(duration).count());
}

// The setup, as it was seen from outside.
struct Setup {
    std::vector<AgentLogRecord> log;
    Json result;
    Json services; // afterwards
    Json server;   // which was asked, with its log; null for none
};

// One login, as it was seen from outside.
struct SeenLogin {
    std::vector<AgentLogRecord> log;
    LoginRecord record;
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

class Story {
  public:
    Story(Session& session, const StoryOptions& options, const fs::path& root, InterruptionGuard& guard)
        : _session(session),
          _options(options),
          _timeLapse(options.timeLapse),
          _root(root),
          _guard(guard),
          _owner(session.buildPlatform({.root = root.string(), .systemLog = &_log}, TimeKind::Real)),
          _installed(_owner->platform()),
          _home(_owner->platform().processIdentity.homeDirectory()) {}

    Report tell(LoginRecord& firstLogin) {
        _prepare();
        _say("");
        _say("Setup, before the first login:");
        const Setup setup = _setUp();
        _say("");
        _say(_timeLapse ? "First login, on simulated time (which stands still while plug-ins work):"
                        : "First login:");
        const SeenLogin first = _login();
        firstLogin = first.record;
        _say("");
        _say("What is left on disk:");
        const LeftOnDisk left = _look();

        _say("");
        _say("Second login. No launch agent is left that would start the agent.");
        _say("Started all the same, it has nothing to do:");
        const FolderSnapshot before(_root);
        const SeenLogin second = _login();
        const std::vector<std::string> changes = before.changesUntilNow();
        _say("  The second login has changed " +
             (changes.empty() ? std::string("nothing.") : changes.front()));

        Report report;
        report.document = {{"account", kExampleAccount},
                           {"root", _root.string()},
                           {"home", _home},
                           {"timeLapse", _timeLapse},
                           {"setup",
                            {{"log", _asJson(setup.log)},
                             {"aliases", setup.result["aliases"]},
                             {"delegates", setup.result["delegates"]},
                             {"services", setup.services},
                             {"server", setup.server}}},
                           {"firstLogin", _asJson(first)},
                           {"left",
                            {{"launchAgent", left.launchAgent},
                             {"replayItem", left.replayItem},
                             {"services", toJson(left.services)},
                             {"files", left.files}}},
                           {"secondLogin", _asJson(second)},
                           {"changedBySecondLogin", changes}};
        report.failure = _failure(first, second, left, changes);
        return report;
    }

  private:
    // The machine

    // Where a path of the story's machine lies. What is there is put there as the machine's maker would, and
    // follows links as this machine has them: none may lead out.
    fs::path _below(const fs::path& path) const {
        fs::path below = _root / path.relative_path();
        if (!fs::weakly_canonical(below).string().starts_with(fs::canonical(_root).string() + "/")) {
            throw CommandFailure("a link leads from " + below.string() + " out of " + _root.string());
        }
        return below;
    }

    // The home folder, the plug-ins and the setup application, as a machine would have them.
    void _prepare() {
        const ExampleFiles examples = findExampleFiles();
        if (makeFolders(_below(_home))) {
            fs::permissions(_below(_home), fs::perms::owner_all);
        }
        const fs::path plugins = _below(kPluginDirectory);
        makeFolders(plugins);
        for (const fs::path& plugin : examples.plugins) {
            copyTree(plugin, plugins / plugin.filename());
        }
        for (const fs::path& plugin : _options.plugins) {
            installPlugin(plugin, plugins);
        }
        makeFolders(_below(kSetupBundlePath).parent_path());
        copyTree(examples.setupBundle, _below(kSetupBundlePath));

        const platform::CloudUser user = exampleUser(_options.responses);
        if (const platform::Outcome outcome = _owner->accountDirectory().storeUser(user); !outcome) {
            throw CommandFailure("cannot add the user: " + outcome.error.message);
        }
        _password = user.password;
        if (!_options.server.empty()) {
            makeFolders(_below(accountserver::kSocketPath).parent_path());
            _server.emplace(_options.server, _root, _guard);
        }
        _sayWhatIsPrepared(examples.plugins.size() + _options.plugins.size());
    }

    std::vector<ServiceState> _services() const {
        return serviceStates(
            _owner->platform().accountService.sharedManager().accountForID(kExampleAccount, false).get());
    }

    // What happens on it

    // Signs in, enables the services that are on before the first login, and hands over what only the user's
    // own login can finish.
    Setup _setUp() {
        Setup setup;
        AgentListener listener;
        listener.record = [&](const AgentLogRecord& record) {
            setup.log.push_back(record);
            _showRecord(record);
        };
        listener.told = [&](const std::string& text) {
            setup.result = Json::parse(text);
        };
        const std::string server = _server ? _server->address() : "";
        const auto build = [&](PlatformOptions options, TimeKind time) {
            options.accountServer = server;
            return _session.buildPlatform(options, time);
        };
        if (build({.root = _root.string()}, TimeKind::Real)->signInDirectory().server() != server) {
            throw CommandFailure("this build of the tool asks no account server");
        }
        const AgentEnd end =
            runChildProcess(build, _root.string(), TimeKind::Real, _guard, listener, setupLife(_password));
        if (!end.succeeded()) {
            throw CommandFailure(setup.result.contains("failure")
                                     ? setup.result["failure"].get<std::string>()
                                     : "the setup ended with " + end.description());
        }
        setup.services = toJson(_services());
        if (_server) {
            setup.server = {{"address", server}, {"log", _server->newLines()}};
            _say("");
            _say("  The account server's own log:");
            for (const Json& line : setup.server["log"]) {
                _say("    " + line.get<std::string>());
            }
        }
        _say("");
        for (const auto& [identifier, aliases] : setup.result["aliases"].items()) {
            _say("  " + std::to_string(aliases.size()) + " aliases chosen for " + identifier);
        }
        _say(std::string("  The replay item is stored for ") + kExampleAccount + ", with " +
             std::to_string(setup.result["delegates"].size()) + " responses.");
        _say("  The launch agent is installed: " + launchAgentPath(_home));
        _showServices(setup.services);
        return setup;
    }

    SeenLogin _login() {
        SeenLogin login;
        ProgressLine progress;
        AgentListener listener;
        listener.record = [&](const AgentLogRecord& record) {
            progress.clear();
            login.log.push_back(record);
            login.record.read(record.time, record.message);
            _showRecord(record);
            if (record.message == agenttext::kLinger) {
                login.lingering = std::chrono::steady_clock::now();
                _showDelegates(login.record);
                if (_timeLapse || !progress.visible()) {
                    _say(_timeLapse ? "  Lingering: the two minutes pass at once on simulated time."
                                    : "  Lingering for two minutes ...");
                }
            }
        };
        if (progress.visible()) {
            listener.tick = [&] {
                _showProgress(progress, login);
            };
        }
        login.end = runAgentProcess(_session.buildPlatform, _root.string(),
                                    _timeLapse ? TimeKind::Simulated : TimeKind::Real, _guard, listener);
        progress.clear();
        _say("  The agent has ended with " + login.end.description() + ".");
        return login;
    }

    LeftOnDisk _look() {
        LeftOnDisk left;
        left.launchAgent = _owner->platform().fileSystem.exists(launchAgentPath(_home));
        left.replayItem = WLGetNimbusReplayKeychainItem(nullptr, nullptr);
        left.services = _services();
        const fs::path home = _below(_home);
        for (const auto& entry : fs::recursive_directory_iterator(home)) {
            if (!entry.is_directory()) {
                left.files.push_back(entry.path().lexically_relative(home).string());
            }
        }
        _say(std::string("  launch agent  ") + (left.launchAgent ? "still there" : "none"));
        _say(std::string("  replay item   ") + (left.replayItem ? "still there" : "none"));
        for (const std::string& file : left.files) {
            _say("  file          " + _home + "/" + file);
        }
        _showServices(toJson(left.services));
        return left;
    }

    // What people see

    void _say(const std::string& line) { _session.printer.tell(Report().line(line)); }

    void _sayWhatIsPrepared(std::size_t plugins) {
        _say("A machine, below " + _root.string() + ":");
        _say("  home folder        " + _home);
        _say("  plug-ins           " + std::to_string(plugins) + " in " + kPluginDirectory);
        _say(std::string("  setup application  ") + kSetupBundlePath);
        _say(std::string("  who can sign in    ") + kExampleAccount);
        if (_server) {
            _say("  account server     " + _options.server.string() + ", asked at " + _server->address());
        }
    }

    void _showRecord(const AgentLogRecord& record) { _say(timedLine(record.time, record.message)); }

    void _showServices(const Json& services) {
        Report report;
        report.line("");
        addServiceTable(report, services, "  ");
        _session.printer.tell(report);
    }

    void _showDelegates(const LoginRecord& record) {
        TextTable table({"DELEGATE", "OUTCOME", "SECONDS"}, "  ");
        for (const DelegateOutcome& delegate : record.delegates()) {
            table.addRow(
                {delegate.identifier, delegate.text(), delegate.seconds.empty() ? "-" : delegate.seconds});
        }
        _session.printer.tell(Report().line("").table(std::move(table)).line(""));
    }

    void _showProgress(ProgressLine& progress, const SeenLogin& login) const {
        const auto now = std::chrono::steady_clock::now();
        if (login.lingering && !_timeLapse) {
            const std::chrono::duration<double> passed = now - *login.lingering;
            progress.show("  Lingering " + ProgressLine::bar(passed / kLinger) + " " +
                          wholeSeconds(now - *login.lingering) + " of " + wholeSeconds(kLinger) + " s");
        } else if (!login.lingering && login.record.working() > 0) {
            progress.show("  " + std::to_string(login.record.working()) + " of " +
                          std::to_string(login.record.delegates().size()) + " delegates at work, " +
                          wholeSeconds(now - login.started) + " s" + _saidProgress(login.record));
        }
    }

    // What those at work have said of it.
    static std::string _saidProgress(const LoginRecord& record) {
        std::string said;
        for (const DelegateOutcome& delegate : record.delegates()) {
            if (delegate.working() && !delegate.progress.empty()) {
                said += "; " + delegate.identifier + ": " + delegate.progress;
            }
        }
        return said;
    }

    // What programs get

    static Json _asJson(const std::vector<AgentLogRecord>& records) {
        Json log = Json::array();
        for (const AgentLogRecord& record : records) {
            log.push_back({{"seconds", std::chrono::duration<double>(record.time).count()},
                           {"message", record.message}});
        }
        return log;
    }

    static Json _asJson(const SeenLogin& login) {
        Json delegates = Json::array();
        for (const DelegateOutcome& delegate : login.record.delegates()) {
            delegates.push_back(
                {{"identifier", delegate.identifier},
                 {"outcome", delegate.text()},
                 {"seconds", delegate.seconds.empty() ? Json() : Json(std::stod(delegate.seconds))}});
        }
        return {{"log", _asJson(login.log)},
                {"delegates", delegates},
                {"exitStatus", login.end.exitStatus ? Json(*login.end.exitStatus) : Json()}};
    }

    static std::optional<std::string> _failure(const SeenLogin& first, const SeenLogin& second,
                                               const LeftOnDisk& left,
                                               const std::vector<std::string>& changes) {
        if (!first.end.succeeded()) {
            return "the agent of the first login ended with " + first.end.description();
        }
        if (left.launchAgent || left.replayItem) {
            return std::string("the first login left the ") +
                   (left.launchAgent ? "launch agent" : "replay item") + " behind";
        }
        for (const ServiceState& service : left.services) {
            if (!service.isEnabled) {
                return "after the first login " + service.entry.name + " is not enabled";
            }
        }
        if (!second.end.succeeded()) {
            return "the agent of the second login ended with " + second.end.description();
        }
        if (!changes.empty()) {
            return "the second login changed " + changes.front();
        }
        return std::nullopt;
    }

    Session& _session;
    const StoryOptions& _options;
    const bool _timeLapse;
    const fs::path _root;
    InterruptionGuard& _guard;
    KeptLog _log;
    const std::shared_ptr<PlatformOwner> _owner;
    const platform::ScopedPlatform _installed;
    const std::string _home;
    std::string _password; // of the story's user
    std::optional<ExampleServer> _server;
};

} // namespace

Report tellStory(Session& session, const StoryOptions& options, const fs::path& root,
                 InterruptionGuard& guard, LoginRecord& firstLogin) {
    return Story(session, options, root, guard).tell(firstLogin);
}

} // namespace welcomer::tool
