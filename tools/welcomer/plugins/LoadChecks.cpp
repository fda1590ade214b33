// What a library does when it is loaded, and what it exports.

#include "plugins/AbiDelegatePlugin.h"
#include "plugins/PluginText.h"
#include "tools/welcomer/plugins/Checks.h"

#include <cstddef>

namespace welcomer::tool::checks {

// That the process is still there afterwards is the answer.
void staticInitialisers(CheckedPlugin& plugin, CheckReport& /*report*/, const CheckInput& /*input*/) {
    plugin.load();
}

void loads(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    if (const std::string reason = plugin.load(); !reason.empty()) {
        report.find(reason);
    }
}

void version(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    plugin.load();
    if (plugin.descriptor().abi_version != WL_DELEGATE_PLUGIN_ABI_VERSION) {
        report.find("version " + std::to_string(plugin.descriptor().abi_version) + " instead of " +
                    std::to_string(WL_DELEGATE_PLUGIN_ABI_VERSION));
    }
}

void structureSize(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    plugin.load();
    std::string reason;
    if (!AbiDelegatePlugin::principalClass(&plugin.descriptor(), reason)) {
        report.find(reason);
    } else if (plugin.descriptor().size > sizeof(wl_delegate_plugin_descriptor)) {
        report.find("the exported structure has " + std::to_string(plugin.descriptor().size) +
                    " bytes, but this version's has " +
                    std::to_string(sizeof(wl_delegate_plugin_descriptor)));
    }
}

void protocol(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    plugin.load();
    if (!AbiDelegatePlugin::conformsToProtocol(plugin.descriptor())) {
        const char* const named = plugin.descriptor().protocol;
        report.find("it names " + (named ? "the protocol " + pluginText(named) : std::string("no protocol")) +
                    " instead of " WL_DELEGATE_PLUGIN_PROTOCOL);
    }
}

void className(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    plugin.load();
    const char* const name = plugin.descriptor().class_name;
    if (!name || *name == '\0') {
        report.find("it has no class name: messages call it (unnamed)");
    } else if (pluginText(name) != name) {
        report.find("the class name is no single line of UTF-8: " + pluginText(name));
    }
}

void createFunction(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    plugin.load();
    if (!plugin.descriptor().create) {
        report.find("create is null");
    }
}

void destroyFunction(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    plugin.load();
    if (!plugin.descriptor().destroy) {
        report.find("destroy is null: what the host does not use is never given back");
    }
}

} // namespace welcomer::tool::checks
