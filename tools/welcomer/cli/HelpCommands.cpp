#include "tools/welcomer/cli/HelpCommands.h"

#include "tools/welcomer/cli/Completions.h"
#include "tools/welcomer/cli/HelpText.h"
#include "tools/welcomer/cli/ManualPages.h"
#include "tools/welcomer/cli/Suggestion.h"
#include "tools/welcomer/terminal/Printable.h"

#include <CLI/CLI.hpp>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <sstream>
#include <unistd.h>

namespace welcomer::tool {

namespace {

constexpr char kCommandValue[] = "COMMAND";

Report help(const CLI::App& app, const std::vector<std::string>& names) {
    const CLI::App* level = &app;
    std::string above;
    for (const std::string& name : names) {
        const std::vector<std::string> known = namesBelow(definitionOf(*level));
        if (std::ranges::find(known, name) == known.end()) {
            throw UsageError("there is no command " + name + didYouMean(name, known));
        }
        above += (above.empty() ? "" : " ") + level->get_name();
        level = level->get_subcommand(name);
    }
    // Not of the level that was called, which is what the library would show.
    const std::string text = level->get_formatter()->make_help(
        level, above + (above.empty() ? "" : " ") + level->get_name(), CLI::AppFormatMode::Normal);
    Report report;
    report.document = {{"help", text}};
    std::istringstream lines(wrapHelp(text, terminalWidth(STDOUT_FILENO)));
    for (std::string line; std::getline(lines, line);) {
        report.line(line);
    }
    return report;
}

Report listValues(Session& session, const CommandLine& commandLine, const std::string& kind) {
    const auto found = commandLine.offeredValues().find(kind);
    if (found == commandLine.offeredValues().end()) {
        throw UsageError("there are no values " + kind);
    }
    const std::vector<std::string> values = found->second(session);
    Report report;
    report.document = values;
    return report.lines(values);
}

std::string contentOf(const std::filesystem::path& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

void write(const std::filesystem::path& path, const std::string& text) {
    std::ofstream file(path, std::ios::binary | std::ios::trunc);
    file << text;
    file.close();
    if (!file) {
        throw CommandFailure(path.string() + " cannot be written");
    }
}

// A shell's own part with the tables in it.
std::string withTables(const std::filesystem::path& path, const std::string& tables) {
    constexpr std::string_view place = "@TABLES@\n";
    std::string text = contentOf(path);
    const std::size_t position = text.find(place);
    if (position == std::string::npos) {
        throw CommandFailure(path.string() + " has no line " +
                             std::string(place.substr(0, place.size() - 1)));
    }
    return text.replace(position, place.size(), tables);
}

Report writeHelp(const CommandDefinition& program, const CommandLine& commandLine,
                 const std::filesystem::path& folder, const std::filesystem::path& parts) {
    std::set<std::string> offered;
    std::ranges::transform(commandLine.offeredValues(), std::inserter(offered, offered.end()),
                           [](const auto& each) { return each.first; });
    write(folder / "welcomer.bash", withTables(parts / "welcomer.bash.in", bashTables(program, offered)));
    write(folder / "_welcomer", withTables(parts / "_welcomer.in", zshTables(program, offered)));
    write(folder / "welcomer.fish", withTables(parts / "welcomer.fish.in", fishTables(program, offered)));
    std::vector<const CommandDefinition*> pages{&program};
    for (const CommandDefinition& command : program.commands) {
        pages.push_back(&command);
    }
    for (const CommandDefinition* const page : pages) {
        const std::string file = pageName(*page) + ".1.scd";
        write(folder / file, manualPage(program, *page, contentOf(parts / "sections" / file)));
    }
    return Report({{"pages", pages.size()}}, "Wrote " + std::to_string(pages.size()) + " pages.");
}

void addHiddenCommands(CLI::App& app, CommandLine& commandLine) {
    const auto kind = std::make_shared<std::string>();
    CommandLevel lister = commandLine.addCommand(
        "list-values", "List what the command line takes in the place of a name, such as USER",
        [kind, &commandLine](Session& session) { return listValues(session, commandLine, *kind); });
    lister.option("name", *kind, "The name, as the help shows it").required();
    lister.hide();

    const auto folder = std::make_shared<std::string>();
    const auto parts = std::make_shared<std::string>();
    CommandLevel writer =
        commandLine.addCommand("write-help", "Write the manual pages and the completions",
                               [folder, parts, &app, &commandLine](Session& /*session*/) {
                                   return writeHelp(definitionOf(app), commandLine, *folder, *parts);
                               });
    writer.option("folder", *folder, "Where to write them").required();
    writer.option("parts", *parts, "The folder of what is written by hand").required();
    writer.hide();
}

} // namespace

void addHelpCommands(CLI::App& app, CommandLine& commandLine) {
    const auto names = std::make_shared<std::vector<std::string>>();
    CommandLevel command = commandLine.addCommand("help", "Explain a command, or show them all",
                                                  [names, &app](Session&) { return help(app, *names); });
    command.option("command", *names, "The command, such as: state set").called(kCommandValue);
    commandLine.offerValues(kCommandValue, [&app](Session&) { return namesBelow(definitionOf(app)); });
    addHiddenCommands(app, commandLine);
}

} // namespace welcomer::tool
