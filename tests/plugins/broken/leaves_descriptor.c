/* Leaves a descriptor open for every program that is started. */

#include "plugin.h"

#include <fcntl.h>

COMPLETION(complete) {
    UNUSED(self, response, slot);
    if (open("/dev/null", O_RDONLY) >= 0) {
        answer(handler);
    }
}
#define COMPLETE complete

#include "whole.h"
