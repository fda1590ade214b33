/* A plug-in that takes its process down; where the test names a file, only once that is there. */

#include "tests/support/exported_plugin.h"

#include <stdlib.h>
#include <unistd.h>

static wl_delegate* create(const wl_host* host, wl_error_slot* slot) {
    (void)host;
    (void)slot;
    const char* const path = getenv("TOOL_TEST_FILE");
    if (!path || access(path, F_OK) == 0) {
        abort();
    }
    return NULL;
}

EXPORT_TEST_PLUGIN("CrashingPlugin");
