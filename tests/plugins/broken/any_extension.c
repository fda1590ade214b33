/* Gives something for every extension that it is asked for. */

#include "plugin.h"

static const void* anything(wl_delegate* self, const char* name) {
    UNUSED(self, name);
    static const int something = 1;
    return &something;
}
#define EXTENSION anything

#include "whole.h"
