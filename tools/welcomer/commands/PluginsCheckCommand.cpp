// welcomer plugins check: whether a plug-in keeps to the rules.

#include "platform/AccountService.h"
#include "tools/welcomer/cli/PropertyListFile.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/plugins/PluginChecks.h"
#include "tools/welcomer/plugins/PluginExamination.h"
#include "tools/welcomer/plugins/SanitizedExamination.h"
#include "tools/welcomer/terminal/InterruptionGuard.h"

#include <filesystem>
#include <memory>

namespace welcomer::tool {

namespace {

constexpr std::size_t kMarkWidth = 9; // of a verdict

struct CheckArguments {
    std::vector<std::string> files;
    std::string response;
    bool isToList = false;
};

Report listChecks() {
    Json checks = Json::array();
    for (const PluginCheck& check : pluginChecks()) {
        checks.push_back({{"name", check.name},
                          {"description", check.description},
                          {"verdict", check.severity == Severity::Failure ? kFailed : kWarned},
                          {"documented", check.documented}});
    }
    Report report;
    report.document = {{"checks", checks}};
    return report.table(checks, {{"CHECK", "name"}, {"A PLUG-IN", "description"}});
}

// What is not as it should be stands out.
void show(Report& report, const std::string& file, const Json& records) {
    report.line(file);
    for (const Json& record : records) {
        const std::string verdict = record["verdict"];
        const Json& seen = record["seen"];
        const bool isBad = verdict == kFailed || verdict == kWarned;
        const std::string mark = verdict == kFailed ? "FAILED" : verdict == kWarned ? "WARNED" : verdict;
        report.line("  " + mark + std::string(kMarkWidth - mark.size(), ' ') +
                    record["name"].get<std::string>() +
                    (seen.is_string() ? ": " + seen.get<std::string>() : ""));
        if (isBad) {
            report.line("  " + std::string(kMarkWidth, ' ') + "see " +
                        record["documented"].get<std::string>());
        }
    }
}

std::size_t countOf(const Json& plugins, const char* verdict) {
    std::size_t count = 0;
    for (const Json& plugin : plugins) {
        for (const Json& record : plugin["checks"]) {
            count += record["verdict"] == verdict ? 1 : 0;
        }
    }
    return count;
}

std::string counted(std::size_t count, const char* verdict) {
    return (count == 1 ? "one check " : std::to_string(count) + " checks ") + verdict;
}

Json examine(Session& session, const std::filesystem::path& file, const CheckArguments& arguments,
             const PropertyList& response, InterruptionGuard& guard) {
    const std::string sanitizer = missingSanitizer(libraryOfPlugin(file));
    return sanitizer.empty() ? examinePlugin(session.buildPlatform, file, response, guard)
                             : examineWithSanitizer(sanitizer, file, arguments.response);
}

Report check(Session& session, const CheckArguments& arguments) {
    const PropertyList response = arguments.response.empty()
                                      ? PropertyList(PropertyList::Dictionary{{platform::kStatusKey, 0}})
                                      : readPropertyListFile(arguments.response);
    InterruptionGuard guard;
    Json plugins = Json::array();
    Report report;
    try {
        for (const std::string& file : arguments.files) {
            if (!std::filesystem::exists(file)) {
                throw CommandFailure("there is no file " + file);
            }
            const Json records =
                examine(session, std::filesystem::absolute(file), arguments, response, guard);
            show(report, file, records);
            plugins.push_back({{"file", file}, {"checks", records}});
        }
    } catch (const Interrupted&) {
        guard.release();
        throw CommandFailure("interrupted");
    }
    report.document = {{"plugins", plugins}};
    if (const std::size_t failed = countOf(plugins, kFailed); failed > 0) {
        report.failure = counted(failed, "failed");
    } else if (const std::size_t warned = countOf(plugins, kWarned); warned > 0) {
        report.failure = counted(warned, "warned");
        report.failureStatus = kExitWarned;
    }
    return report;
}

} // namespace

void addPluginsCheck(CommandLine& commandLine, CommandLevel group) {
    const auto arguments = std::make_shared<CheckArguments>();
    CommandLevel command = commandLine.addCommand(group, "check",
                                                  "Try a plug-in's every rule, each in a process of its own; "
                                                  "exit status 0: it keeps to all, 1: it breaks "
                                                  "one, 3: there are only warnings",
                                                  [arguments](Session& session) {
                                                      if (arguments->isToList) {
                                                          return listChecks();
                                                      }
                                                      if (arguments->files.empty()) {
                                                          throw UsageError("FILE is required");
                                                      }
                                                      return check(session, *arguments);
                                                  });
    command.option("file", arguments->files, "A plug-in's library or folder").called("FILE");
    command
        .option(
            "--response", arguments->response,
            "The server's response, a property list of any type; without it a dictionary with the status 0")
        .called("PLIST");
    command.flag("--list", arguments->isToList, "Show what is checked");
}

} // namespace welcomer::tool
