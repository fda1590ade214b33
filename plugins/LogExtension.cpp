// A plug-in's own lines of the log.

#include "log/PCLogManager.h"
#include "plugins/HostExtensions.h"
#include "plugins/PluginInstances.h"
#include "plugins/PluginText.h"

namespace welcomer {

namespace {

const char* nameOf(wl_log_level level) {
    switch (level) {
    case WL_LOG_ERROR:
        return "error";
    case WL_LOG_WARNING:
        return "warning";
    case WL_LOG_DEBUG:
        return "debug";
    default:
        return "information";
    }
}

extern "C" {

static void writeLine(wl_delegate* self, wl_log_level level, const char* text) {
    if (!text) {
        return;
    }
    try {
        WL_LOG("plug-in %@ %s: %@", pluginNameOf(self).value_or("(unknown)"), nameOf(level),
               pluginText(text));
    } catch (...) {
        // No memory for the line, and no exception may reach a plug-in.
    }
}
}

} // namespace

const wl_log& logExtension() {
    static constexpr wl_log extension{sizeof(wl_log), writeLine};
    return extension;
}

} // namespace welcomer
