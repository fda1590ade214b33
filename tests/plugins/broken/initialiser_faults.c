/* Faults when it is loaded. */

#include "plugin.h"

__attribute__((constructor)) static void initialise(void) {
    raise(SIGSEGV);
}

#include "whole.h"
