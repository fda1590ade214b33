/* Exports a function of its own. */

#include "plugin.h"

__attribute__((visibility("default"))) int a_function_of_its_own(void);
__attribute__((visibility("default"))) int a_function_of_its_own(void) {
    return 1;
}

#include "whole.h"
