/* Never answers. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    UNUSED(&handler);
}
#define COMPLETE complete

#include "whole.h"
