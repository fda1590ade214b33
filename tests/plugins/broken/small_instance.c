/* Says a size of the instance that lacks operations. */

#include "plugin.h"

#define INSTANCE_SIZE offsetof(wl_delegate, messaging_aliases_from_response)

#include "whole.h"
