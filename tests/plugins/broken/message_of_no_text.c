/* Its error is no UTF-8. */

#include "plugin.h"

COMPLETION(complete) {
    UNUSED(self, response, slot);
    handler.call(handler.context, false, 0, "\xff\xfe");
}
#define COMPLETE complete

#include "whole.h"
