/* A plug-in that writes to the standard output, which is the tool's, and to a file that the test names. */

#include <stdio.h>
#include <stdlib.h>
#include <welcomer/delegate_plugin.h>

static const char* identifier(wl_delegate* self, wl_error_slot* slot) {
    (void)self;
    (void)slot;
    return "org.example.talking";
}

static wl_delegate* create(const wl_host* host, wl_error_slot* slot) {
    static wl_delegate delegate = {.size = sizeof delegate, .delegate_identifier = identifier};
    (void)host;
    (void)slot;
    puts("the talking plug-in says hello");
    fflush(stdout);
    const char* const path = getenv("TOOL_TEST_FILE");
    FILE* const file = path ? fopen(path, "w") : NULL;
    if (file) {
        fclose(file);
    }
    return &delegate;
}

static void destroy(wl_delegate* self) {
    (void)self;
}

const wl_delegate_plugin_descriptor wl_delegate_plugin = {
    .abi_version = WL_DELEGATE_PLUGIN_ABI_VERSION,
    .size = sizeof wl_delegate_plugin,
    .protocol = WL_DELEGATE_PLUGIN_PROTOCOL,
    .class_name = "TalkingPlugin",
    .create = create,
    .destroy = destroy,
};
