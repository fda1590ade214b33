/* A plug-in that leaves a file, which the test names, as soon as its library is loaded. */

#include "tests/support/exported_plugin.h"

#include <stdio.h>
#include <stdlib.h>

__attribute__((constructor)) static void leaveTrace(void) {
    const char* const path = getenv("TRACE_OF_LOADING");
    FILE* const file = path ? fopen(path, "w") : NULL;
    if (file) {
        fclose(file);
    }
}

static const char* identifier(wl_delegate* self, wl_error_slot* slot) {
    (void)self;
    (void)slot;
    return "org.example.tracing";
}

static wl_delegate* create(const wl_host* host, wl_error_slot* slot) {
    static wl_delegate delegate = {.size = sizeof delegate, .delegate_identifier = identifier};
    (void)host;
    (void)slot;
    return &delegate;
}

EXPORT_TEST_PLUGIN("TracingPlugin");
