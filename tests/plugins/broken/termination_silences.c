/* Does not answer once it is to stop. */

#include "plugin.h"

static wl_completion_handler kept;
static volatile bool is_stopped;

static void stop(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    is_stopped = true;
}
#define TERMINATE stop

static void* run(void* given) {
    usleep(400000);
    if (!is_stopped) {
        answer(kept);
    }
    return given;
}

COMPLETION(complete) {
    UNUSED(self, response, slot);
    kept = handler;
    pthread_t thread;
    pthread_create(&thread, NULL, run, NULL);
    pthread_detach(thread);
}
#define COMPLETE complete

#include "whole.h"
