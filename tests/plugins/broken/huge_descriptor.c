/* Says a size of its exported structure that no version has. */

#include "plugin.h"

#define DESCRIPTOR_SIZE 4096

#include "whole.h"
