// How far delegates have come. The log is what goes from the agent to whoever watches a login.

#include "log/PCLogManager.h"
#include "plugins/HostExtensions.h"
#include "plugins/PluginInstances.h"
#include "plugins/PluginText.h"

#include <algorithm>
#include <cmath>
#include <string>

namespace welcomer {

namespace {

constexpr int kMaximumLines = 200; // of one delegate

std::string describeProgress(double fraction, const char* text) {
    const double known = std::isnan(fraction) ? 0 : std::clamp(fraction, 0.0, 1.0);
    std::string progress = std::to_string(static_cast<int>(known * 100)) + " %";
    if (text && *text) {
        progress += " " + pluginText(text);
    }
    return progress;
}

extern "C" {

static void reportProgress(wl_delegate* self, double fraction, const char* text) {
    try {
        const std::string progress = describeProgress(fraction, text);
        std::string identifier;
        visitPluginInstance(self, [&](PluginInstance& known) {
            if (known.progressLines < kMaximumLines && known.progress != progress) {
                known.progress = progress;
                ++known.progressLines;
                identifier = known.identifier;
            }
        });
        if (!identifier.empty()) {
            WL_LOG("%@ progress: %@", pluginText(identifier), progress);
        }
    } catch (...) {
        // No memory for the line, and no exception may reach a plug-in.
    }
}
}

} // namespace

const wl_progress& progressExtension() {
    static constexpr wl_progress extension{sizeof(wl_progress), reportProgress};
    return extension;
}

} // namespace welcomer
