/* Releases a value twice. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    wl_value* const copy = host->copy(response);
    host->release(copy);
    host->release(copy);
    answer(handler);
}
#define COMPLETE complete

#include "whole.h"
