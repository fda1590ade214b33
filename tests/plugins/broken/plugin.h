/* What every plug-in here begins with. It defines what it breaks, names that by one of the macros of whole.h, and ends with
 * whole.h, which has the rest as it should be. */

#pragma once

#define _GNU_SOURCE

#include <welcomer/delegate_plugin.h>

#include <pthread.h>
#include <signal.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

static const wl_host* host;

static inline void answer(wl_completion_handler handler) {
    handler.call(handler.context, true, 0, NULL);
}

#define UNUSED(...) ((void)sizeof((const void*[]){__VA_ARGS__}))

#define COMPLETION(name)                                                                                     \
    static void name(wl_delegate* self, const wl_value* response, wl_completion_handler handler,             \
                     wl_error_slot* slot)
