/* A plug-in that takes its process down. */

#include <stdlib.h>
#include <welcomer/delegate_plugin.h>

static wl_delegate* create(const wl_host* host, wl_error_slot* slot) {
    (void)host;
    (void)slot;
    abort();
}

static void destroy(wl_delegate* self) {
    (void)self;
}

const wl_delegate_plugin_descriptor wl_delegate_plugin = {
    .abi_version = WL_DELEGATE_PLUGIN_ABI_VERSION,
    .size = sizeof wl_delegate_plugin,
    .protocol = WL_DELEGATE_PLUGIN_PROTOCOL,
    .class_name = "CrashingPlugin",
    .create = create,
    .destroy = destroy,
};
