/* Says a size of its exported structure that lacks destroy. */

#include "plugin.h"

#define DESCRIPTOR_SIZE offsetof(wl_delegate_plugin_descriptor, destroy)

#include "whole.h"
