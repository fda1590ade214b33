/* Is a delegate that gets aliases, and cannot take them. */

#include "plugin.h"

static const char* name(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    return "com.corvid.chatter";
}
#define IDENTIFIER name

#include "whole.h"
