/* Everything that a plug-in in C includes and uses, for every standard and compiler. */

#include <welcomer/delegate_plugin.h>
#include <welcomer/extensions/context.h>
#include <welcomer/extensions/dispatch.h>
#include <welcomer/extensions/log.h>
#include <welcomer/extensions/progress.h>

static const wl_log* lines;

static const char* identifier(wl_delegate* self, wl_error_slot* slot) {
    (void)slot;
    if (lines) {
        lines->write(self, WL_LOG_DEBUG, "asked");
    }
    return "org.example.use";
}

static wl_delegate* create(const wl_host* host, wl_error_slot* slot) {
    static wl_delegate delegate;
    if (!WL_HAS_MEMBER(host, release)) {
        return NULL;
    }
    if (WL_HAS_MEMBER(host, get_extension)) {
        lines = (const wl_log*)host->get_extension(WL_EXTENSION_LOG);
    }
    (void)slot;
    delegate.size = (uint32_t)sizeof delegate;
    delegate.delegate_identifier = identifier;
    return &delegate;
}

const wl_delegate_plugin_descriptor wl_delegate_plugin = {WL_DELEGATE_PLUGIN_ABI_VERSION,
                                                          (uint32_t)sizeof(wl_delegate_plugin_descriptor),
                                                          WL_DELEGATE_PLUGIN_PROTOCOL,
                                                          "Use",
                                                          create,
                                                          NULL};
