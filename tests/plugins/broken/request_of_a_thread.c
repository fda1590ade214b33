/* Has a request on one thread alone. */

#include "plugin.h"

static pthread_t first;

static wl_value* ask(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    if (first && !pthread_equal(first, pthread_self())) {
        return NULL;
    }
    first = pthread_self();
    return host->new_dictionary();
}
#define REQUEST ask

#include "whole.h"
