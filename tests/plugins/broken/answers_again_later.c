/* Answers a second time, on a thread of its own. */

#include "plugin.h"

static wl_completion_handler kept;

static void* run(void* given) {
    usleep(50000);
    answer(kept);
    return given;
}

COMPLETION(complete) {
    UNUSED(self, response, slot);
    kept = handler;
    answer(handler);
    pthread_t thread;
    pthread_create(&thread, NULL, run, NULL);
    pthread_detach(thread);
}
#define COMPLETE complete

#include "whole.h"
