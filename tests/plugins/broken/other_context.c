/* Answers with a context that it was not given. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    handler.call(handler.context + 1, true, 0, NULL);
}
#define COMPLETE complete

#include "whole.h"
