/* Is of another version. */

#include "plugin.h"

#define ABI_VERSION 2

#include "whole.h"
