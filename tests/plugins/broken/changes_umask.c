/* Changes the umask. */

#include "plugin.h"

#include <sys/stat.h>

COMPLETION(complete) {
    UNUSED(self, response, slot);
    umask(0);
    answer(handler);
}
#define COMPLETE complete

#include "whole.h"
