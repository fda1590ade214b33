/* Exports nothing that a host knows. */

#include "plugin.h"

#define HAS_NO_SYMBOL

#include "whole.h"

/* So that it is used all the same. */
__attribute__((visibility("hidden")))
const void* const nobody_sees_this[] = {&instance, (const void*)&CREATE, (const void*)&DESTROY};
