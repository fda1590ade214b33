/* Faults when there is nothing to destroy. */

#include "plugin.h"

static void take(wl_delegate* self) {
    self->size = 0;
}
#define DESTROY take

#include "whole.h"
