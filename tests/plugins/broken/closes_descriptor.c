/* Closes a descriptor of the host. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    close(STDIN_FILENO);
    answer(handler);
}
#define COMPLETE complete

#include "whole.h"
