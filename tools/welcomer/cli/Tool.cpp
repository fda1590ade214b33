#include "tools/welcomer/cli/Tool.h"

#include "plugins/PluginContext.h"
#include "tools/welcomer/cli/AsUser.h"
#include "tools/welcomer/cli/Definition.h"
#include "tools/welcomer/cli/HelpCommands.h"
#include "tools/welcomer/cli/HelpText.h"
#include "tools/welcomer/cli/Suggestion.h"
#include "tools/welcomer/terminal/Printable.h"

#include <CLI/CLI.hpp>
#include <filesystem>
#include <iostream>
#include <optional>
#include <unistd.h>
#include <utility>

namespace welcomer::tool {

namespace {

int fail(const std::string& reason, int status) {
    std::cout.flush();
    std::cerr << "welcomer: " << printable(reason) << '\n';
    return status;
}

// What every level of the command line has in common.
void configure(CLI::App& app) {
    app.fallthrough(); // the options for every command may stand before and after it
    app.get_formatter()->column_width(kHelpColumn);
    app.get_formatter()->label("SUBCOMMAND", "COMMAND");
    app.get_formatter()->label("SUBCOMMANDS", "COMMAND");
    app.get_formatter()->label("REQUIRED", "(required)");
}

CLI::App& addLevel(CLI::App& parent, const std::string& name, const std::string& description) {
    CLI::App& level = *parent.add_subcommand(name, description);
    configure(level);
    level.group("Commands");
    level.footer("For every command: --root, --json, --verbose (see welcomer --help).");
    return level;
}

std::string fullName(const CLI::App& app) {
    return app.get_parent() ? fullName(*app.get_parent()) + " " + app.get_name() : app.get_name();
}

// The last of the commands that the arguments named.
const CLI::App& namedLast(const CLI::App& app) {
    const std::vector<CLI::App*> named = app.get_subcommands();
    return named.empty() ? app : namedLast(*named.front());
}

// The options that are known at this level, those of the levels above among them.
std::vector<std::string> optionsAt(const CLI::App& level) {
    std::vector<std::string> names =
        level.get_parent() ? optionsAt(*level.get_parent()) : std::vector<std::string>();
    for (const OptionDefinition& option : definitionOf(level).options) {
        names.insert(names.end(), option.names.begin(), option.names.end());
    }
    return names;
}

// What is wrong with the arguments at this level.
std::string explain(const CLI::ParseError& error, const CLI::App& app, const CLI::App& level) {
    const std::vector<std::string> unknown = app.remaining(true); // they fall through to the top
    const std::string first = unknown.empty() ? "" : unknown.front().substr(0, unknown.front().find('='));
    const bool isOption = first.starts_with('-');
    const std::string meant =
        didYouMean(first, isOption ? optionsAt(level) : namesBelow(definitionOf(level)));
    const bool needsCommand = level.get_require_subcommand_min() > 0;
    if (!needsCommand || !dynamic_cast<const CLI::RequiredError*>(&error)) {
        return error.what() + (isOption && dynamic_cast<const CLI::ExtrasError*>(&error) ? meant : "");
    }
    if (first.empty()) {
        return "a command is needed";
    }
    return (isOption ? "there is no option " : "there is no command ") + first + meant;
}

void addGlobalOptions(CLI::App& app, Options& options) {
    app.add_option("--root", options.root,
                   "Look up every path of the system, the home folder among them, below this folder")
        ->type_name("DIR")
        ->check([](const std::string& folder) {
            return std::string(folder.empty() ? "the folder's name is empty" : "");
        });
    app.add_flag("--json", options.json, "Print the result as one JSON document");
    app.add_flag("--verbose", options.verbose, "Show the system's log lines on stderr as they come");
    app.set_version_flag("--version", "welcomer " WELCOMER_VERSION);
}

// Reads the command line.
//  result  the exit status when there is nothing left to do
std::optional<int> parse(CLI::App& app, int argc, char** argv) {
    try {
        app.parse(argc, argv);
        return std::nullopt;
    } catch (const CLI::CallForVersion& version) {
        std::cout << version.what() << '\n';
        return kExitSuccess;
    } catch (const CLI::CallForHelp&) {
        std::cout << wrapHelp(app.help(), terminalWidth(STDOUT_FILENO));
        return kExitSuccess;
    } catch (const CLI::ParseError& error) {
        const CLI::App& level = namedLast(app);
        return fail(explain(error, app, level) + " (see " + fullName(level) + " --help)", kExitUsage);
    }
}

void settleRoot(Options& options) {
    options.rootGiven = !options.root.empty();
    if (!options.rootGiven) {
        options.root = "/";
    } else if (!std::filesystem::is_directory(options.root)) {
        throw CommandFailure("--root: there is no folder " + options.root);
    } else {
        options.root = std::filesystem::canonical(options.root).string();
    }
}

// Says on stderr, at its end, which preferences were damaged: they count as empty.
class DamageReport {
  public:
    explicit DamageReport(platform::PreferenceStore& preferences) : _preferences(preferences) {}
    ~DamageReport() {
        std::cout.flush();
        for (const platform::DamagedPreferences& damage : _preferences.damagedPreferences()) {
            const std::string place =
                damage.setAsidePath.empty() ? "still in their place" : "now at " + damage.setAsidePath;
            std::cerr << printable("welcomer: the preferences " + damage.domain + " are damaged (" +
                                   damage.reason + ") and " + place)
                      << '\n';
        }
    }
    DamageReport(const DamageReport&) = delete;
    DamageReport& operator=(const DamageReport&) = delete;

  private:
    platform::PreferenceStore& _preferences;
};

//  directory  takes the place of the machine's own, or null
int runCommand(const Command& command, const Options& options, const PlatformFactory& buildPlatform,
               platform::SignInDirectory* directory = nullptr) {
    KeptLog log;
    log.setVerbose(options.verbose);
    const auto owner = buildPlatform({.root = options.root,
                                      .systemLog = &log,
                                      .signInDirectory = directory,
                                      .storesCredentialsLocally = options.storesLocally},
                                     TimeKind::Real);
    const platform::ScopedPlatform installed(owner->platform());
    setPluginRoot(options.root);
    const DamageReport damageReport(owner->platform().preferenceStore);
    ReportPrinter printer(std::cout, STDOUT_FILENO, options.json);
    Session session{options, buildPlatform, owner->accountDirectory(), owner->signInDirectory(),
                    log,     printer};
    const Report report = command(session);
    printer.print(report);
    std::cout.flush();
    if (!std::cout) {
        return fail("the output could not be written", kExitFailed);
    }
    return report.failure ? fail(*report.failure, report.failureStatus) : kExitSuccess;
}

int runChosen(const CommandLine& commandLine, Options& options, const PlatformFactory& buildPlatform) {
    settleRoot(options);
    std::optional<posix::PasswordEntry> user;
    if (!options.user.empty()) {
        user = userToActFor(options.user);
        options.storesLocally = true;
    }
    if (commandLine.chosenPreparation()) {
        commandLine.chosenPreparation()(options);
    }
    const Command& command = commandLine.chosen();
    if (!user) {
        return runCommand(command, options, buildPlatform);
    }
    return runAsUser(*user, options.root, buildPlatform, [&](platform::SignInDirectory& directory) {
        return runCommand(command, options, buildPlatform, &directory);
    });
}

} // namespace

void tellAskedServer(Session& session) {
    if (const std::string server = session.signInDirectory.server(); !server.empty()) {
        session.printer.tell(Report({}, "Asking the account server " + server));
    }
}

CommandLevel CommandLine::addGroup(const std::string& name, const std::string& description) {
    CLI::App& group = addLevel(_app, name, description);
    group.require_subcommand(1);
    return CommandLevel(group);
}

CommandLevel CommandLine::addCommand(const std::string& name, const std::string& description,
                                     Command command) {
    return addCommand(CommandLevel(_app), name, description, std::move(command));
}

CommandLevel CommandLine::addCommand(CommandLevel group, const std::string& name,
                                     const std::string& description, Command command) {
    if (_needsHome) {
        command = [command = std::move(command)](Session& session) {
            platform::current().processIdentity.homeDirectory(); // throws where there is none
            return command(session);
        };
    }
    CLI::App& added = addLevel(group.level(), name, description);
    added.callback([this, &added, command = std::move(command)] {
        _chosen = command;
        _chosenName = fullName(added);
    });
    return CommandLevel(added);
}

void CommandLine::addLocalOption(CommandLevel command) {
    command.flag("--local", _options.storesLocally,
                 "Store the replay item in the user's local file, whatever keyring there is; the agent "
                 "finds it there");
}

CommandOption CommandLine::addUserOption(CommandLevel command) {
    return command
        .option("--user", _options.user,
                "Act for this user of the machine, who logs in later; only root can. The user's "
                "keyring is "
                "not there: what is stored goes to the user's local file")
        .called("NAME")
        .checked([](const std::string& name) {
            return std::string(name.empty() ? "the user's name is empty" : "");
        });
}

void CommandLine::addPreparation(CommandLevel command, Preparation preparation) {
    command.level().parse_complete_callback(
        [this, preparation = std::move(preparation)] { _chosenPreparation = preparation; });
}

void CommandLine::addPasswordOption(CommandLevel command, PasswordSource& source) {
    command
        .option("--password-fd", source,
                "Read the password, one line, from this open descriptor instead of the terminal")
        .called("N")
        .notNegative();
}

int runTool(int argc, char** argv, const PlatformFactory& buildPlatform,
            std::span<const CommandAdder> commands) {
    CLI::App app(
        "Finishes a user's cloud-account setup after the first login: looks at it, tries it, prepares it.",
        "welcomer");
    configure(app);
    app.require_subcommand(1);
    app.footer("Results go to stdout, errors to stderr.\n"
               "Exit status: 0 done, 1 failed, 2 the command line makes no sense.");
    Options options;
    addGlobalOptions(app, options);
    CommandLine commandLine(app, options);
    for (const CommandAdder& adder : commands) {
        commandLine.setNeedsHome(adder.needsHome);
        adder.add(commandLine);
    }
    commandLine.setNeedsHome(false);
    addHelpCommands(app, commandLine);
    if (const auto status = parse(app, argc, argv)) {
        return *status;
    }

    try {
        return runChosen(commandLine, options, buildPlatform);
    } catch (const UsageError& error) {
        return fail(std::string(error.what()) + " (see " + commandLine.chosenName() + " --help)", kExitUsage);
    } catch (const std::filesystem::filesystem_error& error) {
        return fail(error.path1().string() + ": " + error.code().message(), kExitFailed);
    } catch (const std::exception& error) {
        return fail(error.what(), kExitFailed);
    }
}

} // namespace welcomer::tool
