/* Its name for messages has two lines. */

#include "plugin.h"

#define CLASS_NAME "Broken\nforged line"

#include "whole.h"
