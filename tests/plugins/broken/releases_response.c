/* Releases the response. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    host->release((wl_value*)response);
    answer(handler);
}
#define COMPLETE complete

#include "whole.h"
