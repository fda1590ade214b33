/* Faults in place of an answer. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    UNUSED(&handler);
    raise(SIGBUS);
}
#define COMPLETE complete

#include "whole.h"
