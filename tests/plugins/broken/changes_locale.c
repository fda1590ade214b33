/* Changes the locale. */

#include "plugin.h"

#include <locale.h>

__attribute__((constructor)) static void initialise(void) {
    setlocale(LC_ALL, "C.UTF-8");
}

#include "whole.h"
