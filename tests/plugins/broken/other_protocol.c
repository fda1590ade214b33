/* Names another protocol. */

#include "plugin.h"

#define PROTOCOL "SomethingElse"

#include "whole.h"
