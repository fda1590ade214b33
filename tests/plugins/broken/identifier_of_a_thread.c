/* Has another identifier on every other thread. */

#include "plugin.h"

static pthread_t first;

static const char* name(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    if (!pthread_equal(first, pthread_self()) && first) {
        return "org.example.other";
    }
    first = pthread_self();
    return "org.example.broken";
}
#define IDENTIFIER name

#include "whole.h"
