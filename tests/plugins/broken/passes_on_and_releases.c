/* Releases what it has put into a container. */

#include "plugin.h"

static wl_value* ask(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    wl_value* const request = host->new_dictionary();
    wl_value* const number = host->new_integer(1);
    host->dictionary_set(request, "version", WL_NUL_TERMINATED, number);
    host->release(number);
    return request;
}
#define REQUEST ask

#include "whole.h"
