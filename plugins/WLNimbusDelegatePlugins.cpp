#include "plugins/WLNimbusDelegatePlugins.h"

#include "log/PCLogManager.h"
#include "platform/Platform.h"
#include "plugins/AbiDelegatePlugin.h"
#include "plugins/HostExtensions.h"
#include "plugins/PluginMark.h"
#include "plugins/PluginText.h"

#include <exception>
#include <string_view>
#include <unordered_set>
#include <utility>

namespace welcomer {

namespace {

// The part behind the last point; a point that begins the name begins no extension.
std::string_view pathExtension(std::string_view fileName) {
    const std::size_t point = fileName.rfind('.');
    return point == std::string_view::npos || point == 0 ? std::string_view() : fileName.substr(point + 1);
}

// Loading runs the library's own initialisers. What they throw cannot be caught: the loader lets no exception
// through, and the process ends there. The mark is for who says so then.
const wl_delegate_plugin_descriptor* loadPrincipalClass(const std::string& fileName, std::string& reason) {
    const PluginMark mark(fileName.c_str());
    const platform::PluginSymbol symbol = platform::current().pluginBundle.load(
        std::string(kPluginDirectory) + "/" + fileName, WL_DELEGATE_PLUGIN_SYMBOL);
    if (symbol.address) {
        return AbiDelegatePlugin::principalClass(symbol.address, reason);
    }
    reason = symbol.reason;
    return nullptr;
}

// A new instance, or null; one that raises is none.
std::shared_ptr<WLFirstRunDelegateConfiguration>
makeInstance(const wl_delegate_plugin_descriptor& principalClass, const std::string& fileName,
             std::string& reason) {
    try {
        auto plugin = AbiDelegatePlugin::create(principalClass, fileName);
        if (!plugin) {
            reason = "made no plug-in object";
        }
        return plugin;
    } catch (...) {
        reason = text::describe(std::current_exception());
        return nullptr;
    }
}

// Loads and checks one entry. On return either the plug-in and its identifier are set, or the reason.
void loadEntry(PluginScanEntry& entry) {
    const auto shownName = [&entry] {
        return pluginText(entry.fileName);
    };
    const auto* principalClass = loadPrincipalClass(entry.fileName, entry.reason);
    if (!principalClass) {
        WL_LOG("Nimbus Plugins: Failed to get principal class for %@", shownName());
        return;
    }
    if (!AbiDelegatePlugin::conformsToProtocol(*principalClass)) {
        WL_LOG("Nimbus Plugins: Principal class for %@ does not conform to protocol", shownName());
        entry.reason = "does not conform to " WL_DELEGATE_PLUGIN_PROTOCOL;
        return;
    }
    auto plugin = makeInstance(*principalClass, entry.fileName, entry.reason);
    if (!plugin) {
        WL_LOG("Nimbus Plugins: Failed to init plugin object for %@", shownName());
        return;
    }
    try {
        entry.identifier = plugin->delegateIdentifier();
    } catch (...) {
        const std::exception_ptr exception = std::current_exception();
        WL_LOG("Nimbus Plugins: Exception querying '%@' for id on load: %@", shownName(), exception);
        entry.reason = text::describe(exception);
        return;
    }
    if (!entry.identifier) {
        WL_LOG("Nimbus Plugins: '%@' does not specify a plugin identifier", shownName());
        entry.reason = "has no identifier";
        return;
    }
    entry.plugin = std::move(plugin);
}

DelegatePluginArray loadDelegatePlugins() {
    // The thread that will wait for the plug-ins has its run loop before there are any: what that loop stands
    // on a plug-in's own thread could otherwise take first.
    setPluginMainLoop();
    DelegatePluginArray plugins;
    for (PluginScanEntry& entry : scanDelegatePlugins()) {
        if (entry.plugin) {
            plugins.push_back(std::move(entry.plugin));
        }
    }
    return plugins;
}

} // namespace

std::vector<PluginScanEntry>
scanDelegatePlugins(const std::function<bool(const std::string& fileName)>& isWanted) {
    std::vector<PluginScanEntry> entries;
    std::unordered_set<std::string> identifiers;
    const auto fileNames = platform::current().fileSystem.list(kPluginDirectory);
    for (const std::string& fileName : fileNames.value_or(std::vector<std::string>())) {
        if (pathExtension(fileName) != kPluginExtension || (isWanted && !isWanted(fileName))) {
            continue;
        }
        PluginScanEntry& entry = entries.emplace_back();
        entry.fileName = fileName;
        loadEntry(entry);
        if (entry.plugin && !identifiers.insert(*entry.identifier).second) {
            WL_LOG("Nimbus Plugins: duplicate plugins with id '%@', only one will be used",
                   pluginText(*entry.identifier));
            entry.plugin.reset();
            entry.reason = "another plug-in has the same identifier";
        }
    }
    return entries;
}

const DelegatePluginArray& WLNimbusDelegatePlugins() {
    // Never destroyed: completions may still run while the process ends.
    static const auto* const plugins = new DelegatePluginArray(loadDelegatePlugins());
    return *plugins;
}

} // namespace welcomer
