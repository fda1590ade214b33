/* Reads a value that it has released. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    wl_value* const copy = host->copy(response);
    host->release(copy);
    host->count(copy);
    answer(handler);
}
#define COMPLETE complete

#include "whole.h"
