/* Answers twice. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    answer(handler);
    answer(handler);
}
#define COMPLETE complete

#include "whole.h"
