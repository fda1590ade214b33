/* A thread of its own fails an assertion. */

#include "plugin.h"

static void* run(void* given) {
    abort();
    return given;
}

COMPLETION(complete) {
    UNUSED(self, response, slot);
    UNUSED(&handler);
    pthread_t thread;
    pthread_create(&thread, NULL, run, NULL);
    pthread_detach(thread);
}
#define COMPLETE complete

#include "whole.h"
