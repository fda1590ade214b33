/* Faults when an instance is to be made. */

#include "plugin.h"

static wl_delegate* make(const wl_host* given, wl_error_slot* slot);
#define CREATE make

#include "whole.h"

static wl_delegate* make(const wl_host* given, wl_error_slot* slot) {
    host = given;
    UNUSED(slot);
    raise(SIGSEGV);
    return &instance;
}
