/* Cannot make an instance. */

#include "plugin.h"

#define CREATE NULL
extern const wl_delegate* unused_instance;

#include "whole.h"

__attribute__((visibility("hidden"))) const wl_delegate* unused_instance = &instance;
