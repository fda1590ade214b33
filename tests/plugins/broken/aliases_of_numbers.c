/* Offers aliases that are no texts. */

#include "plugin.h"

static const char* name(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    return "com.corvid.chatter";
}
#define IDENTIFIER name

static void complete(wl_delegate* self, const wl_value* response, const wl_value* aliases,
                     wl_completion_handler handler, wl_error_slot* slot) {
    UNUSED(self, response, aliases, slot);
    answer(handler);
}
#define COMPLETE_WITH_ALIASES complete

static wl_value* offer(wl_delegate* self, const wl_value* response, wl_error_slot* slot) {
    UNUSED(self, response, slot);
    wl_value* const aliases = host->new_array();
    host->array_append(aliases, host->new_integer(1));
    return aliases;
}
#define OFFERED_ALIASES offer

#include "whole.h"
