/* A plug-in that takes its process down; where the test names a file, only once that is there. */

#include <stdlib.h>
#include <unistd.h>
#include <welcomer/delegate_plugin.h>

static wl_delegate* create(const wl_host* host, wl_error_slot* slot) {
    (void)host;
    (void)slot;
    const char* const path = getenv("TOOL_TEST_FILE");
    if (!path || access(path, F_OK) == 0) {
        abort();
    }
    return NULL;
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
