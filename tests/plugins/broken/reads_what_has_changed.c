/* Reads an element of an array that has changed since. */

#include "plugin.h"

static wl_value* ask(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    wl_value* const array = host->new_array();
    host->array_append(array, host->new_integer(1));
    const wl_value* const first = host->array_at(array, 0);
    host->array_append(array, host->new_integer(2));
    host->value_type(first);
    host->release(array);
    return NULL;
}
#define REQUEST ask

#include "whole.h"
