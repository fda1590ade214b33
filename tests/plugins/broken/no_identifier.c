/* Has no identifier. */

#include "plugin.h"

static const char* name(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    return NULL;
}
#define IDENTIFIER name

#include "whole.h"
