/* Raises when it is asked for its request. */

#include "plugin.h"

static wl_value* ask(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    host->raise(slot, "no such table");
    return NULL;
}
#define REQUEST ask

#include "whole.h"
