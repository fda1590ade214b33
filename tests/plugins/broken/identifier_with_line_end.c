/* Its identifier holds a line end. */

#include "plugin.h"

static const char* name(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    return "org.example.broken\n";
}
#define IDENTIFIER name

#include "whole.h"
