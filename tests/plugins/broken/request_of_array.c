/* Asks for an array. */

#include "plugin.h"

static wl_value* ask(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    return host->new_array();
}
#define REQUEST ask

#include "whole.h"
