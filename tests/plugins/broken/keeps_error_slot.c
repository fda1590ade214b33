/* Raises with the error slot of a call that has ended. */

#include "plugin.h"

static wl_error_slot* kept;

static wl_value* ask(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self);
    kept = slot;
    return NULL;
}
#define REQUEST ask

COMPLETION(complete) {
    UNUSED(self, response, slot);
    host->raise(kept, "too late");
    answer(handler);
}
#define COMPLETE complete

#include "whole.h"
