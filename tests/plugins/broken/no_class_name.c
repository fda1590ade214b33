/* Has no name for messages. */

#include "plugin.h"

#define CLASS_NAME NULL

#include "whole.h"
