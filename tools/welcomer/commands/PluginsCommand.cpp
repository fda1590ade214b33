// welcomer plugins: what is in the plug-in directory, and what became of it.

#include "plugins/WLNimbusDelegatePlugins.h"
#include "tools/welcomer/cli/StandardOutputGuard.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"

namespace welcomer::tool {

namespace {

std::string stateOf(const PluginScanEntry& entry) {
    return entry.plugin ? "loaded" : entry.reason;
}

std::vector<PluginScanEntry> scan() {
    const StandardOutputGuard guard;
    return scanDelegatePlugins();
}

Report listPlugins(Session& /*session*/) {
    Json plugins = Json::array();
    for (const PluginScanEntry& entry : scan()) {
        plugins.push_back({{"identifier", entry.identifier ? Json(*entry.identifier) : Json()},
                           {"file", entry.fileName},
                           {"state", stateOf(entry)}});
    }
    Report report;
    report.document = {{"directory", kPluginDirectory}, {"plugins", plugins}};
    if (plugins.empty()) {
        return report.line(std::string("No plug-ins in ") + kPluginDirectory);
    }
    return report.table(plugins, {{"IDENTIFIER", "identifier"}, {"FILE", "file"}, {"STATE", "state"}});
}

} // namespace

void addPluginsCommands(CommandLine& commandLine) {
    CommandLevel group = commandLine.addGroup("plugins", "The delegate plug-ins of this machine");
    commandLine.addCommand(
        group, "list",
        "Load every plug-in and show its identifier, its file, and its state: loaded, or why "
        "it was skipped",
        listPlugins);
}

} // namespace welcomer::tool
