/* Ends the thread that calls it. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    answer(handler);
    pthread_exit(NULL);
}
#define COMPLETE complete

#include "whole.h"
