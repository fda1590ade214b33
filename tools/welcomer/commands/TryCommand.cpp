// welcomer try: the whole story, from the setup to the end of the second login, in a fresh folder.

#include "cloud/WLNimbusServiceCatalogue.h"
#include "handoff/LaunchAgentFile.h"
#include "handoff/ReplayItem.h"
#include "plugins/DelegateIdentifiers.h"
#include "plugins/WLNimbusDelegatePlugins.h"
#include "tools/welcomer/cli/PropertyListOutput.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/story/AgentProcess.h"
#include "tools/welcomer/story/DelegateReport.h"
#include "tools/welcomer/story/ExampleFiles.h"
#include "tools/welcomer/story/FolderCopy.h"
#include "tools/welcomer/story/FolderSnapshot.h"
#include "tools/welcomer/story/ServiceStates.h"
#include "tools/welcomer/story/SetupFlow.h"
#include "tools/welcomer/story/TemporaryFolder.h"
#include "tools/welcomer/terminal/Printable.h"
#include "tools/welcomer/terminal/ProgressLine.h"
#include "tools/welcomer/terminal/TextTable.h"

#include <CLI/CLI.hpp>
#include <filesystem>
#include <iomanip>
#include <iostream>
#include <optional>
#include <ostream>
#include <random>
#include <sstream>
#include <utility>

namespace welcomer::tool {

namespace {

namespace fs = std::filesystem;

constexpr const char* kAccountName = "user@nimbus.example";
constexpr const char* kLingerLine = "delaying exit by two minutes";
constexpr std::chrono::seconds kLinger{120};

// A new user of the story's own, with what the server answers.
platform::CloudUser exampleUser() {
    // The example plug-ins take as long as the response says, so that one sees them work beside one another.
    const auto response = [](double delaySeconds) {
        return PropertyList::Dictionary{{"status", 0}, {"delaySeconds", delaySeconds}};
    };
    PropertyList::Dictionary vidlink = response(0.8);
    PropertyList::Dictionary chatter = response(0.5);
    vidlink["aliases"] = PropertyList::Array{kAccountName, "+1 555 0100"};
    chatter["aliases"] = PropertyList::Array{kAccountName};
    std::random_device random;
    std::ostringstream password;
    password << std::hex << random() << random();
    return {kAccountName,
            password.str(),
            kAccountName,
            {{"status", 0},
             {kReplayDelegatesKey, PropertyList::Dictionary{{kVidlinkIdentifier, vidlink},
                                                            {kChatterIdentifier, chatter},
                                                            {kStorefrontIdentifier, response(1.0)}}}}};
}

// The setup application's whole life, in a process of its own. Tells a document with the chosen aliases, or
// with the reason for which it failed.
ChildLife setupLife(const std::string& password) {
    return [password](const KeptLog& log, const std::function<void(const std::string&)>& tell) {
        try {
            SetupFlow::checkWhoIsLoggedIn(kAccountName);
            SetupFlow flow(log, std::cout, false);
            flow.signIn(kAccountName, password);
            ChosenAliases aliases;
            for (const AliasOffer& offer : flow.aliasOffers()) {
                aliases[offer.identifier] = offer.aliases;
            }
            flow.checkHandOver(aliases);
            flow.complete(WLNimbusAllSetupServiceIDs(), false);
            const auto bundle = platform::current().resourceBundles.open(kSetupBundlePath);
            flow.handOver(aliases, *bundle);
            tell(Json{{"aliases", aliases}, {"delegates", flow.delegates()}}.dump());
            return kExitSuccess;
        } catch (const std::exception& error) {
            tell(Json{{"failure", error.what()}}.dump(-1, ' ', false, Json::error_handler_t::replace));
            return kExitFailed;
        }
    };
}

std::string seconds(std::chrono::nanoseconds duration) {
    std::ostringstream text;
    text << std::fixed << std::setprecision(3) << std::chrono::duration<double>(duration).count();
    return text.str();
}

// The setup, as it was seen from outside.
struct Setup {
    std::vector<AgentLogRecord> log;
    Json result;
    std::vector<ServiceState> services; // afterwards
};

// One login, as it was seen from outside.
struct Login {
    std::vector<AgentLogRecord> log;
    DelegateReport report;
    AgentEnd end;
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
    Story(Session& session, bool timeLapse, const fs::path& root, InterruptionGuard& guard)
        : _session(session),
          _timeLapse(timeLapse),
          _root(root),
          _guard(guard),
          _owner(session.buildPlatform({.root = root.string(), .systemLog = &_log}, TimeKind::Real)),
          _installed(_owner->platform()),
          _home(_owner->platform().processIdentity.homeDirectory()) {}

    void tell() {
        _prepare();
        _say("");
        _say("Setup, before the first login:");
        const Setup setup = _setUp();
        _say("");
        _say(_timeLapse ? "First login, on simulated time (which stands still while plug-ins work):"
                        : "First login:");
        const Login first = _login();
        _say("");
        _say("What is left on disk:");
        const LeftOnDisk left = _look();

        _say("");
        _say("Second login. No launch agent is left that would start the agent.");
        _say("Started all the same, it has nothing to do:");
        const FolderSnapshot before(_root);
        const Login second = _login();
        const std::vector<std::string> changes = before.changesUntilNow();
        _say("  The second login has changed " +
             (changes.empty() ? std::string("nothing.") : changes.front()));

        if (_session.options.json) {
            _printAsJson(setup, first, second, left, changes);
        }
        _judge(first, second, left, changes);
    }

  private:
    void _say(const std::string& line) {
        if (!_session.options.json) {
            _session.out << line << std::endl; // at once: people watch
        }
    }

    // Where a path of the story's machine lies. What is there is put there as the machine's maker would, and
    // follows links as this machine has them: none may lead out.
    fs::path _below(const fs::path& path) const {
        fs::path below = _root / path.relative_path();
        if (!fs::weakly_canonical(below).string().starts_with(fs::canonical(_root).string() + "/")) {
            throw CommandFailure("a link leads from " + below.string() + " out of " + _root.string());
        }
        return below;
    }

    std::string _launchAgentPath() const {
        return _home + "/Library/LaunchAgents/" + kLaunchAgentLabel + ".plist";
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
        makeFolders(_below(kSetupBundlePath).parent_path());
        copyTree(examples.setupBundle, _below(kSetupBundlePath));

        const platform::CloudUser user = exampleUser();
        if (const platform::Outcome outcome = _owner->accountDirectory().storeUser(user); !outcome) {
            throw CommandFailure("cannot add the user: " + outcome.error.message);
        }
        _password = user.password;

        _say("A machine, below " + _root.string() + ":");
        _say("  home folder        " + _home);
        _say("  plug-ins           " + std::to_string(examples.plugins.size()) + " in " + kPluginDirectory);
        _say(std::string("  setup application  ") + kSetupBundlePath);
        _say(std::string("  who can sign in    ") + kAccountName);
    }

    void _showRecord(const AgentLogRecord& record) {
        std::ostringstream line;
        line << std::setw(11) << seconds(record.time) << "  " << printable(record.message);
        _say(line.str());
    }

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
        const AgentEnd end = runChildProcess(_session.buildPlatform, _root.string(), TimeKind::Real, _guard,
                                             listener, setupLife(_password));
        if (!end.succeeded()) {
            throw CommandFailure(setup.result.contains("failure")
                                     ? setup.result["failure"].get<std::string>()
                                     : "the setup ended with " + end.description());
        }
        setup.services = _services();
        _say("");
        for (const auto& [identifier, aliases] : setup.result["aliases"].items()) {
            _say("  " + std::to_string(aliases.size()) + " aliases chosen for " + identifier);
        }
        _say(std::string("  The replay item is stored for ") + kAccountName + ", with " +
             std::to_string(setup.result["delegates"].size()) + " responses.");
        _say("  The launch agent is installed: " + _launchAgentPath());
        _showServices(setup.services);
        return setup;
    }

    std::vector<ServiceState> _services() const {
        return serviceStates(
            _owner->platform().accountService.sharedManager().accountForID(kAccountName, false).get());
    }

    void _showServices(const std::vector<ServiceState>& services) {
        if (!_session.options.json) {
            _session.out << '\n';
            printServiceStates(_session.out, services, "  ");
            _session.out << std::flush;
        }
    }

    Login _login() {
        Login login;
        ProgressLine progress;
        const auto started = std::chrono::steady_clock::now();
        std::optional<std::chrono::steady_clock::time_point> lingering;
        AgentListener listener;
        listener.record = [&](const AgentLogRecord& record) {
            progress.clear();
            login.log.push_back(record);
            login.report.read(record.message);
            _showRecord(record);
            if (record.message == kLingerLine) {
                lingering = std::chrono::steady_clock::now();
                _showDelegates(login.report);
                if (_timeLapse || !progress.visible()) {
                    _say(_timeLapse ? "  Lingering: the two minutes pass at once on simulated time."
                                    : "  Lingering for two minutes ...");
                }
            }
        };
        if (progress.visible()) {
            listener.tick = [&] {
                _showProgress(progress, login.report, started, lingering);
            };
        }
        login.end = runAgentProcess(_session.buildPlatform, _root.string(),
                                    _timeLapse ? TimeKind::Simulated : TimeKind::Real, _guard, listener);
        progress.clear();
        _say("  The agent has ended with " + login.end.description() + ".");
        return login;
    }

    void _showDelegates(const DelegateReport& report) {
        if (_session.options.json) {
            return;
        }
        TextTable table({"DELEGATE", "OUTCOME", "SECONDS"});
        for (const DelegateOutcome& delegate : report.delegates()) {
            table.addRow(
                {delegate.identifier, delegate.outcome, delegate.seconds.empty() ? "-" : delegate.seconds});
        }
        _session.out << '\n';
        table.print(_session.out, "  ");
        _session.out << std::endl;
    }

    void _showProgress(ProgressLine& progress, const DelegateReport& report,
                       std::chrono::steady_clock::time_point started,
                       std::optional<std::chrono::steady_clock::time_point> lingering) const {
        const auto now = std::chrono::steady_clock::now();
        const auto whole = [](auto duration) {
            return std::to_string(std::chrono::duration_cast<std::chrono::seconds>(duration).count());
        };
        if (lingering && !_timeLapse) {
            const std::chrono::duration<double> passed = now - *lingering;
            progress.show("  Lingering " + ProgressLine::bar(passed / kLinger) + " " + whole(passed) +
                          " of " + whole(kLinger) + " s");
        } else if (!lingering && report.working() > 0) {
            progress.show("  " + std::to_string(report.working()) + " of " +
                          std::to_string(report.delegates().size()) + " delegates at work, " +
                          whole(now - started) + " s");
        }
    }

    LeftOnDisk _look() {
        LeftOnDisk left;
        left.launchAgent = _owner->platform().fileSystem.exists(_launchAgentPath());
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
        _showServices(left.services);
        return left;
    }

    static Json _logAsJson(const std::vector<AgentLogRecord>& records) {
        Json log = Json::array();
        for (const AgentLogRecord& record : records) {
            log.push_back({{"seconds", std::chrono::duration<double>(record.time).count()},
                           {"message", record.message}});
        }
        return log;
    }

    static Json _loginAsJson(const Login& login) {
        Json delegates = Json::array();
        for (const DelegateOutcome& delegate : login.report.delegates()) {
            delegates.push_back(
                {{"identifier", delegate.identifier},
                 {"outcome", delegate.outcome},
                 {"seconds", delegate.seconds.empty() ? Json() : Json(std::stod(delegate.seconds))}});
        }
        return {{"log", _logAsJson(login.log)},
                {"delegates", delegates},
                {"exitStatus", login.end.exitStatus ? Json(*login.end.exitStatus) : Json()}};
    }

    void _printAsJson(const Setup& setup, const Login& first, const Login& second, const LeftOnDisk& left,
                      const std::vector<std::string>& changes) {
        printJson(_session.out, {{"account", kAccountName},
                                 {"root", _root.string()},
                                 {"home", _home},
                                 {"timeLapse", _timeLapse},
                                 {"setup",
                                  {{"log", _logAsJson(setup.log)},
                                   {"aliases", setup.result["aliases"]},
                                   {"delegates", setup.result["delegates"]},
                                   {"services", toJson(setup.services)}}},
                                 {"firstLogin", _loginAsJson(first)},
                                 {"left",
                                  {{"launchAgent", left.launchAgent},
                                   {"replayItem", left.replayItem},
                                   {"services", toJson(left.services)},
                                   {"files", left.files}}},
                                 {"secondLogin", _loginAsJson(second)},
                                 {"changedBySecondLogin", changes}});
    }

    static void _judge(const Login& first, const Login& second, const LeftOnDisk& left,
                       const std::vector<std::string>& changes) {
        if (!first.end.succeeded()) {
            throw CommandFailure("the agent of the first login ended with " + first.end.description());
        }
        if (left.launchAgent || left.replayItem) {
            throw CommandFailure(std::string("the first login left the ") +
                                 (left.launchAgent ? "launch agent" : "replay item") + " behind");
        }
        for (const ServiceState& service : left.services) {
            if (!service.isEnabled) {
                throw CommandFailure("after the first login " + service.entry.name + " is not enabled");
            }
        }
        if (!second.end.succeeded()) {
            throw CommandFailure("the agent of the second login ended with " + second.end.description());
        }
        if (!changes.empty()) {
            throw CommandFailure("the second login changed " + changes.front());
        }
    }

    Session& _session;
    const bool _timeLapse;
    const fs::path _root;
    InterruptionGuard& _guard;
    KeptLog _log;
    const std::shared_ptr<PlatformOwner> _owner;
    const platform::ScopedPlatform _installed;
    const std::string _home;
    std::string _password; // of the story's user
};

void tryStory(Session& session, bool timeLapse) {
    const Options& options = session.options;
    if (options.rootGiven && options.root == "/") {
        throw UsageError("--root: the story needs a folder of its own, not the machine's own root");
    }
    // Before anything is made that an interruption would leave behind.
    InterruptionGuard guard;
    try {
        std::optional<TemporaryFolder> temporary;
        if (!options.rootGiven) {
            temporary.emplace();
        }
        Story(session, timeLapse, temporary ? temporary->path() : fs::path(options.root), guard).tell();
    } catch (const Interrupted&) {
        guard.release(); // the signal takes its course here
        throw CommandFailure("interrupted");
    }
    if (!options.json) {
        session.out << '\n'
                    << (options.rootGiven ? options.root + " is left as it is."
                                          : "The temporary folder is removed.")
                    << '\n';
    }
}

} // namespace

void addTryCommand(CommandLine& commandLine) {
    const auto timeLapse = std::make_shared<bool>(false);
    CLI::App& command = commandLine.addCommand(
        "try", "Walk the whole story in a fresh folder (or below --root), from the setup to the second login",
        [timeLapse](Session& session) { tryStory(session, *timeLapse); });
    command.add_flag("--time-lapse", *timeLapse,
                     "Run the agent on simulated time: the two minutes pass at once");
}

} // namespace welcomer::tool
