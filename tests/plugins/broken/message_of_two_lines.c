/* Its error has two lines. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    handler.call(handler.context, false, 0, "failed\nforged line");
}
#define COMPLETE complete

#include "whole.h"
