/* Changes the working directory. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    if (chdir("/usr") == 0) {
        answer(handler);
    }
}
#define COMPLETE complete

#include "whole.h"
