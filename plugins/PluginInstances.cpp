#include "plugins/PluginInstances.h"

#include "plugins/PluginMark.h"
#include "plugins/PluginText.h"

#include <mutex>
#include <unordered_map>

namespace welcomer {

namespace {

struct Instances {
    std::mutex mutex;
    std::unordered_map<const wl_delegate*, PluginInstance> known;
};

// Never destroyed: plug-in threads may still call while the process ends.
Instances& instances() {
    static auto* const all = new Instances;
    return *all;
}

} // namespace

void addPluginInstance(const wl_delegate* instance, const std::string& name) {
    const std::lock_guard lock(instances().mutex);
    PluginInstance& added = instances().known[instance];
    added.name = name;
    ++added.holders;
}

void removePluginInstance(const wl_delegate* instance) {
    const std::lock_guard lock(instances().mutex);
    const auto found = instances().known.find(instance);
    if (found != instances().known.end() && --found->second.holders == 0) {
        instances().known.erase(found);
    }
}

bool visitPluginInstance(const wl_delegate* instance, const std::function<void(PluginInstance&)>& visit) {
    const std::lock_guard lock(instances().mutex);
    const auto found = instances().known.find(instance);
    if (found == instances().known.end()) {
        return false;
    }
    visit(found->second);
    return true;
}

std::optional<std::string> pluginNameOf(const wl_delegate* instance) {
    std::string name;
    if (visitPluginInstance(instance, [&](const PluginInstance& known) { name = known.name; })) {
        return pluginText(name);
    }
    const char* const current = PluginMark::current();
    return current ? std::optional(pluginText(current)) : std::nullopt;
}

} // namespace welcomer
