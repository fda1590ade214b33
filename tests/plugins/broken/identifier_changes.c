/* Its identifier changes. */

#include "plugin.h"

static const char* name(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    static int calls = 0;
    return calls++ == 0 ? "org.example.broken" : "org.example.other";
}
#define IDENTIFIER name

#include "whole.h"
