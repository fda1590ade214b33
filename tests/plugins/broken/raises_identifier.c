/* Raises when it is asked for its identifier. */

#include "plugin.h"

static const char* name(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    host->raise(slot, "no such table");
    return "org.example.broken";
}
#define IDENTIFIER name

#include "whole.h"
