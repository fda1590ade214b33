/* Names no protocol. */

#include "plugin.h"

#define PROTOCOL NULL

#include "whole.h"
