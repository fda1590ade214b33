/* Takes it that there are chosen aliases. */

#include "plugin.h"

static const char* name(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    return "com.corvid.chatter";
}
#define IDENTIFIER name

static void complete(wl_delegate* self, const wl_value* response, const wl_value* aliases,
                     wl_completion_handler handler, wl_error_slot* slot) {
    UNUSED(self, response, aliases, slot);
    if (!aliases) {
        raise(SIGSEGV);
    }
    answer(handler);
}
#define COMPLETE_WITH_ALIASES complete

static wl_value* offer(wl_delegate* self, const wl_value* response, wl_error_slot* slot) {
    UNUSED(self, response, slot);
    return NULL;
}
#define OFFERED_ALIASES offer

#include "whole.h"
