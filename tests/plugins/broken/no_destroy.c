/* Cannot give an instance back. */

#include "plugin.h"

#define DESTROY NULL

#include "whole.h"
