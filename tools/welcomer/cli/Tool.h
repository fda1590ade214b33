// The frame of the tool: its command line, its exit status, and what it hands to each command.

#pragma once

#include "platform/AccountDirectory.h"
#include "platform/SignInDirectory.h"
#include "tools/welcomer/cli/CommandLevel.h"
#include "tools/welcomer/cli/KeptLog.h"
#include "tools/welcomer/cli/PlatformFactory.h"
#include "tools/welcomer/cli/Report.h"
#include "tools/welcomer/terminal/Failure.h"
#include "tools/welcomer/terminal/Password.h"

#include <functional>
#include <map>
#include <span>
#include <string>
#include <utility>
#include <vector>

namespace welcomer::tool {

inline constexpr int kExitSuccess = 0;
inline constexpr int kExitFailed = 1;
inline constexpr int kExitUsage = 2;
inline constexpr int kExitWarned = 3; // of the commands that know warnings

// The options that every command takes.
struct Options {
    std::string root; // absolute; "/" when none was given
    bool rootGiven = false;
    bool json = false;
    bool verbose = false;
    bool storesLocally = false; // what `--local` asks for, of the commands that have it
    std::string user = {};      // whom `--user` names, of the commands that have it; empty: the caller
};

// What a command works with. The platform for the chosen root is installed while it runs.
struct Session {
    const Options& options;
    const PlatformFactory& buildPlatform;
    platform::AccountDirectory& accountDirectory;     // below the chosen root
    const platform::SignInDirectory& signInDirectory; // whom signing in asks
    const KeptLog& log;                               // the system's own log lines so far
    ReportPrinter& printer;                           // for what people are told on the way
};

// Tells people which account server signing in asks; nothing where it asks none.
void tellAskedServer(Session& session);

// A command's work: it returns what it has to say, and what it throws ends the tool with one line on stderr.
using Command = std::function<Report(Session&)>;

// What a command does as its caller, before its own work begins and the user of `--user` does it: reading
// what the command line names and that user may not see. It fails as a command does.
using Preparation = std::function<void(const Options&)>;

// What a command registers itself with: the command line being built, and the place for the chosen command.
class CommandLine {
  public:
    //  options  where the options for every command are put; borrowed
    CommandLine(CLI::App& app, Options& options) : _app(app), _options(options) {}

    // A group of commands, such as `replay`: it is called with one of the commands below it.
    CommandLevel addGroup(const std::string& name, const std::string& description);

    // A command below the program or a group.
    //  command  what it does; runs after the whole command line has been read
    //  result   the place for its options
    CommandLevel addCommand(const std::string& name, const std::string& description, Command command);
    CommandLevel addCommand(CommandLevel group, const std::string& name, const std::string& description,
                            Command command);

    // Whether the commands that are added next need a home folder: where the user has none, they end with one
    // line that says so.
    void setNeedsHome(bool needsHome) { _needsHome = needsHome; }

    // Gives a command the option `--local`, which has the platform store new credentials in the local store.
    void addLocalOption(CommandLevel command);

    // Gives a command the option `--user`, which has another user do its work (AsUser.h). That user has no
    // session, so that new credentials go to the local store.
    CommandOption addUserOption(CommandLevel command);

    // Gives a command something to do first.
    void addPreparation(CommandLevel command, Preparation preparation);

    // Gives a command the option `--password-fd`.
    static void addPasswordOption(CommandLevel command, PasswordSource& source);

    // Says what can stand where the command line takes this value, such as "USER": for completions.
    //  values  may fail: they are as good as none then
    using ValueSource = std::function<std::vector<std::string>(Session&)>;
    void offerValues(const std::string& name, ValueSource values) { _offered[name] = std::move(values); }
    const std::map<std::string, ValueSource>& offeredValues() const { return _offered; }

    // The command that the arguments chose, with its full name.
    const Command& chosen() const { return _chosen; }
    const Preparation& chosenPreparation() const { return _chosenPreparation; } // or none
    const std::string& chosenName() const { return _chosenName; }

  private:
    CLI::App& _app;
    Options& _options;
    bool _needsHome = false;
    std::map<std::string, ValueSource> _offered;
    Command _chosen;
    Preparation _chosenPreparation;
    std::string _chosenName;
};

// What adds commands, and whether these work with what lies in the user's home.
struct CommandAdder {
    void (*add)(CommandLine& commandLine);
    bool needsHome;
};

// Runs the tool.
//  commands  all that it has, in the order in which --help shows them
//  result    the exit status: 0, kExitFailed or kExitUsage
// Main thread, no other thread running.
int runTool(int argc, char** argv, const PlatformFactory& buildPlatform,
            std::span<const CommandAdder> commands);

} // namespace welcomer::tool
