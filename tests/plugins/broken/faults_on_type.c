/* Cannot take a response of one type, which the command line names. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    if (host->value_type(response) == TYPE) {
        raise(SIGSEGV);
    }
    answer(handler);
}
#define COMPLETE complete

#include "whole.h"
