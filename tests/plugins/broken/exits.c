/* Exits in place of an answer. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    UNUSED(&handler);
    exit(7);
}
#define COMPLETE complete

#include "whole.h"
