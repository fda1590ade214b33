/* Ends the process at once, with success. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    UNUSED(&handler);
    _exit(0);
}
#define COMPLETE complete

#include "whole.h"
