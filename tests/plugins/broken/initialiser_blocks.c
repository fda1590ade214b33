/* Never comes back from being loaded. */

#include "plugin.h"

__attribute__((constructor)) static void initialise(void) {
    for (;;) {
        pause();
    }
}

#include "whole.h"
