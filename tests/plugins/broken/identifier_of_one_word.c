/* Its identifier is in no reverse-domain form. */

#include "plugin.h"

static const char* name(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    return "broken";
}
#define IDENTIFIER name

#include "whole.h"
