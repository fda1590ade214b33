/* Exits when it is loaded. */

#include "plugin.h"

__attribute__((constructor)) static void initialise(void) {
    exit(0);
}

#include "whole.h"
