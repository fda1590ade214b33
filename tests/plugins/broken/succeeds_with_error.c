/* Succeeds, with an error. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    handler.call(handler.context, true, 0, "failed");
}
#define COMPLETE complete

#include "whole.h"
