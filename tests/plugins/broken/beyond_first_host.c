/* Takes it that every host has what this one has. */

#include "plugin.h"

static wl_delegate* make(const wl_host* given, wl_error_slot* slot);
#define CREATE make

#include "whole.h"

static wl_delegate* make(const wl_host* given, wl_error_slot* slot) {
    host = given;
    UNUSED(slot);
    given->get_extension("org.example.something/1");
    return &instance;
}
