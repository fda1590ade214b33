/* Has a buffer for short texts alone. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    char buffer[4096];
    size_t length = 0;
    const char* const text =
        host->get_string(host->dictionary_get(response, "text", WL_NUL_TERMINATED), &length);
    if (text && length >= sizeof buffer) {
        abort(); /* where it would write on */
    }
    answer(handler);
}
#define COMPLETE complete

#include "whole.h"
