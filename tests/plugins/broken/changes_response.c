/* Writes into the response. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    if (host->value_type(response) == WL_VALUE_DICTIONARY) {
        host->dictionary_set((wl_value*)response, "seen", WL_NUL_TERMINATED, host->new_boolean(true));
    }
    answer(handler);
}
#define COMPLETE complete

#include "whole.h"
