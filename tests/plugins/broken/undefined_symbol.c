/* Needs a function that nobody has. */

#include "plugin.h"

void nobody_has_this_function(void);
COMPLETION(complete) {
    UNUSED(self, response, slot);
    nobody_has_this_function();
    answer(handler);
}
#define COMPLETE complete

#include "whole.h"
