/* Answers, and raises. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    answer(handler);
    host->raise(slot, "no such table");
}
#define COMPLETE complete

#include "whole.h"
