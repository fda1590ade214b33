/* Leaks a value with every request. */

#include "plugin.h"

static wl_value* ask(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    host->new_string("leaked", WL_NUL_TERMINATED);
    return host->new_dictionary();
}
#define REQUEST ask

#include "whole.h"
