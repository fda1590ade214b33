/* Takes it that a dictionary has what it looks for. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    int64_t status = 0;
    if (host->value_type(response) == WL_VALUE_DICTIONARY &&
        !host->get_integer(host->dictionary_get(response, "status", WL_NUL_TERMINATED), &status) &&
        host->count(response) == 0) {
        raise(SIGSEGV);
    }
    answer(handler);
}
#define COMPLETE complete

#include "whole.h"
