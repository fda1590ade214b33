/* Takes no values within values within values. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    const wl_value* each = response;
    for (int depth = 0; (each = host->dictionary_get(each, "deeper", WL_NUL_TERMINATED)); ++depth) {
        if (depth == 0) {
            abort(); /* where its stack of values is full */
        }
    }
    answer(handler);
}
#define COMPLETE complete

#include "whole.h"
