/* Writes behind what it has, which the address sanitizer sees. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    char* const text = malloc(4);
    volatile int behind = 4;
    text[behind] = 'x';
    free(text);
    answer(handler);
}
#define COMPLETE complete

#include "whole.h"
