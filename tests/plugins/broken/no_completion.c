/* Lacks a required operation. */

#include "plugin.h"

#define COMPLETE NULL

#include "whole.h"
