// welcomer plugins: what is in the plug-in directory, and what became of it.

#include "plugins/WLNimbusDelegatePlugins.h"
#include "tools/welcomer/cli/PropertyListOutput.h"
#include "tools/welcomer/cli/StandardOutputGuard.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/terminal/TextTable.h"

#include <CLI/CLI.hpp>
#include <ostream>

namespace welcomer::tool {

namespace {

std::string stateOf(const PluginScanEntry& entry) {
    return entry.plugin ? "loaded" : entry.reason;
}

void printAsJson(std::ostream& out, const std::vector<PluginScanEntry>& entries) {
    Json plugins = Json::array();
    for (const PluginScanEntry& entry : entries) {
        plugins.push_back({{"identifier", entry.identifier ? Json(*entry.identifier) : Json()},
                           {"file", entry.fileName},
                           {"state", stateOf(entry)}});
    }
    printJson(out, {{"directory", kPluginDirectory}, {"plugins", plugins}});
}

void printAsTable(std::ostream& out, const std::vector<PluginScanEntry>& entries) {
    if (entries.empty()) {
        out << "No plug-ins in " << kPluginDirectory << '\n';
        return;
    }
    TextTable table({"IDENTIFIER", "FILE", "STATE"});
    for (const PluginScanEntry& entry : entries) {
        table.addRow({entry.identifier.value_or("-"), entry.fileName, stateOf(entry)});
    }
    table.print(out);
}

std::vector<PluginScanEntry> scan(std::ostream& out) {
    const StandardOutputGuard guard(out);
    return scanDelegatePlugins();
}

void listPlugins(Session& session) {
    const std::vector<PluginScanEntry> entries = scan(session.out);
    if (session.options.json) {
        printAsJson(session.out, entries);
    } else {
        printAsTable(session.out, entries);
    }
}

} // namespace

void addPluginsCommands(CommandLine& commandLine) {
    CLI::App& group = commandLine.addGroup("plugins", "The delegate plug-ins of this machine");
    commandLine.addCommand(
        group, "list",
        "Load every plug-in and show its identifier, its file, and its state: loaded, or why "
        "it was skipped",
        listPlugins);
}

} // namespace welcomer::tool
