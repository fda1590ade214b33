// welcomer plugins: what is in the plug-in directory, what became of it, and how a plug-in fares at a login.

#include "platform/AccountService.h"
#include "plugins/WLNimbusDelegatePlugins.h"
#include "tools/welcomer/checks/ChildOutput.h"
#include "tools/welcomer/cli/PropertyListFile.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/plugins/PluginListing.h"
#include "tools/welcomer/story/PluginTrial.h"
#include "tools/welcomer/terminal/InterruptionGuard.h"

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <future>
#include <memory>
#include <optional>
#include <sstream>

namespace welcomer::tool {

namespace {

Report showPlugins(Session& session) {
    InterruptionGuard guard;
    Report report;
    try {
        const Json plugins = listPlugins(session.buildPlatform, session.options.root, guard);
        report.document = {{"directory", kPluginDirectory}, {"plugins", plugins}};
        const auto skipped =
            std::ranges::count_if(plugins, [](const Json& plugin) { return plugin["state"] != kLoaded; });
        if (skipped > 0) {
            report.failure = skipped == 1 ? "one plug-in does not load"
                                          : std::to_string(skipped) + " plug-ins do not load";
        }
        if (plugins.empty()) {
            return report.line(std::string("No plug-ins in ") + kPluginDirectory);
        }
        return report.table(plugins, {{"IDENTIFIER", "identifier"}, {"FILE", "file"}, {"STATE", "state"}});
    } catch (const Interrupted&) {
        guard.release();
        throw CommandFailure("interrupted");
    }
}

struct TryArguments {
    std::vector<std::string> files;
    std::string response;
    std::optional<std::string> aliases;
    std::string account = "user@nimbus.example";
    std::uint64_t times = 1;
    std::uint64_t limit = 60;
    bool concurrent = false;
};

std::vector<std::string> separated(const std::string& texts) {
    std::vector<std::string> parts;
    std::istringstream in(texts);
    for (std::string part; std::getline(in, part, ',');) {
        parts.push_back(part);
    }
    return parts;
}

PluginTrialOptions trialOptions(const TryArguments& arguments) {
    PluginTrialOptions options;
    for (const std::string& file : arguments.files) {
        if (!std::filesystem::exists(file)) {
            throw CommandFailure("there is no file " + file);
        }
        options.plugins.push_back(std::filesystem::absolute(file));
    }
    options.response = arguments.response.empty()
                           ? PropertyList(PropertyList::Dictionary{{platform::kStatusKey, 0}})
                           : readPropertyListFile(arguments.response);
    if (arguments.aliases) {
        options.aliases = separated(*arguments.aliases);
    }
    options.account = arguments.account;
    options.limit = std::chrono::seconds(arguments.limit);
    return options;
}

std::string shownOutcome(const Json& plugin) {
    const Json message = plugin.value("message", Json());
    return plugin["outcome"].get<std::string>() +
           (message.is_string() ? ": " + message.get<std::string>() : "");
}

void showValue(Report& report, const char* label, const Json& plugin, const char* key) {
    const Json value = plugin.value(key, Json());
    report.line(std::string("  ") + label +
                (value.is_null() ? "-" : value.dump(-1, ' ', false, Json::error_handler_t::replace)));
}

void showRunning(Report& report, const Json& running) {
    if (!running.is_object()) {
        return;
    }
    for (const char* kind : {"threads", "processes"}) {
        std::string names;
        for (const Json& name : running[kind]) {
            names += (names.empty() ? "" : ", ") + name.get<std::string>();
        }
        report.line(std::string("  left running, ") + kind + ": " + (names.empty() ? "none" : names));
    }
}

void showTrial(Report& report, const Json& trial) {
    for (const Json& plugin : trial["plugins"]) {
        const Json identifier = plugin.value("identifier", Json());
        report.line(plugin["file"].get<std::string>() +
                    (identifier.is_string() ? ": " + identifier.get<std::string>() : ""));
        showValue(report, "request   ", plugin, "request");
        showValue(report, "response  ", plugin, "response");
        report.line("  outcome   " + shownOutcome(plugin));
        showValue(report, "seconds   ", plugin, "seconds");
        showValue(report, "progress  ", plugin, "progress");
    }
    report.line("The agent ended with " + trial["end"].get<std::string>() + ".");
    report.line("  threads seen besides the main one: " + trial["threads"].dump());
    showRunning(report, trial["leftRunning"]);
}

// Each login in a process of its own, side by side: the command line again, for one.
Json trialsSideBySide(const TryArguments& arguments) {
    std::vector<std::string> command{
        "/proc/self/exe", "--json",          "plugins", "try",
        "--account",      arguments.account, "--limit", std::to_string(arguments.limit)};
    if (!arguments.response.empty()) {
        command.insert(command.end(), {"--response", arguments.response});
    }
    if (arguments.aliases) {
        command.insert(command.end(), {"--aliases", *arguments.aliases});
    }
    command.emplace_back("--");
    command.insert(command.end(), arguments.files.begin(), arguments.files.end());
    std::vector<std::future<ChildOutput>> running;
    for (std::uint64_t time = 0; time < arguments.times; ++time) {
        running.push_back(std::async(std::launch::async, outputOf, std::cref(command),
                                     std::chrono::seconds(2 * arguments.limit + 30)));
    }
    Json trials = Json::array();
    for (std::future<ChildOutput>& each : running) {
        const ChildOutput output = each.get();
        const Json document = Json::parse(output.text, nullptr, false);
        if (!output.trouble.empty() || !document.is_object()) {
            throw CommandFailure("one of the logins has told nothing" +
                                 (output.trouble.empty() ? "" : ": " + output.trouble));
        }
        trials.push_back(document["logins"].at(0));
    }
    return trials;
}

Json trialsInTurn(Session& session, const TryArguments& arguments, InterruptionGuard& guard) {
    const PluginTrialOptions options = trialOptions(arguments);
    Json trials = Json::array();
    for (std::uint64_t time = 0; time < arguments.times; ++time) {
        trials.push_back(tryPlugins(session.buildPlatform, options, guard));
    }
    return trials;
}

Report tryThem(Session& session, const TryArguments& arguments) {
    InterruptionGuard guard;
    try {
        Report report;
        report.document = {{"logins", arguments.concurrent && arguments.times > 1
                                          ? trialsSideBySide(arguments)
                                          : trialsInTurn(session, arguments, guard)}};
        std::size_t failed = 0;
        for (const Json& trial : report.document["logins"]) {
            showTrial(report, trial);
            failed += haveCompleted(trial) ? 0 : 1;
        }
        if (failed > 0) {
            report.failure = std::to_string(failed) + " of " +
                             std::to_string(report.document["logins"].size()) +
                             " logins did not complete every plug-in";
        }
        return report;
    } catch (const Interrupted&) {
        guard.release();
        throw CommandFailure("interrupted");
    }
}

void addTry(CommandLine& commandLine, CommandLevel group) {
    const auto arguments = std::make_shared<TryArguments>();
    CommandLevel command = commandLine.addCommand(
        group, "try",
        "Complete plug-ins as the agent does at a login, in a temporary folder: show what each asked for, "
        "got and "
        "answered, and what it left running; exit status 0: all completed, 1: one did not",
        [arguments](Session& session) { return tryThem(session, *arguments); });
    command
        .option("file", arguments->files, "A plug-in's library or folder; several are completed side by side")
        .called("FILE")
        .required();
    command
        .option(
            "--response", arguments->response,
            "The server's response, a property list of any type; without it a dictionary with the status 0")
        .called("PLIST");
    command.option("--aliases", arguments->aliases, "The aliases that the user chose, with commas between")
        .called("A,B");
    command.option("--account", arguments->account, "The cloud account's user name").called("NAME");
    command.option("--times", arguments->times, "How many logins").called("N").within(1, 1000);
    command.flag("--concurrent", arguments->concurrent, "Have these logins at the same time");
    command.option("--limit", arguments->limit, "How many seconds to wait for an answer; 60 without it")
        .called("SECONDS")
        .within(1, 3600);
}

} // namespace

void addPluginsCommands(CommandLine& commandLine) {
    CommandLevel group = commandLine.addGroup("plugins", "The delegate plug-ins of this machine");
    commandLine.addCommand(
        group, "list",
        "Load every plug-in, in a process of their own, and show its identifier, its file, and its state: "
        "loaded, or why it was skipped; exit status 0: all are loaded, 1: one is not",
        showPlugins);
    addTry(commandLine, group);
    addPluginsCheck(commandLine, group);
}

} // namespace welcomer::tool
