/* A plug-in that writes to the standard output, which is the tool's, and to a file that the test names. */

#include "tests/support/exported_plugin.h"

#include <stdio.h>
#include <stdlib.h>

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

EXPORT_TEST_PLUGIN("TalkingPlugin");
