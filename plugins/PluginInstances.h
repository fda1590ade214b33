// The instances that plug-ins have made, as the plug-ins themselves name them to the host.

#pragma once

#include "sdk/welcomer/delegate_plugin.h"

#include <functional>
#include <optional>
#include <string>

namespace welcomer {

// What is known of one. Texts as they came, not as a log line may hold them.
struct PluginInstance {
    std::string name;       // of the plug-in's entry
    std::string identifier; // empty until it was learnt
    int holders = 0;        // a plug-in may make one and the same again

    // What it has said of its progress.
    int progressLines = 0;
    std::string progress;
};

// Makes one known, and takes that back. Any thread.
void addPluginInstance(const wl_delegate* instance, const std::string& name);
void removePluginInstance(const wl_delegate* instance);

// Shows what is known of an instance, under a lock: `visit` calls nothing of this file, and writes no log line.
//  result  false when it is not known; `visit` is not called then
// Any thread.
bool visitPluginInstance(const wl_delegate* instance, const std::function<void(PluginInstance&)>& visit);

// The name of the plug-in that an instance belongs to; where that is not known, of the one that the calling thread is
// in; none without either. Fit for a log line. Any thread.
std::optional<std::string> pluginNameOf(const wl_delegate* instance);

} // namespace welcomer
