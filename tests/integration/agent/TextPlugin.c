/*
 * A plug-in whose texts try to forge lines of the system log and to lose its own: TEXT_PLUGIN says which of
 * them it is.
 */

#include "tests/support/exported_plugin.h"

#include <stdlib.h>
#include <string.h>

/* A line's end, a record's beginning, a terminal's escapes, and separators that some programs take for a
 * line's end. */
#define FORGERY "\n<115>forged\x1b[2J\x7f\r\xc2\x85\xc2\x9b\xe2\x80\xa8\xe2\x80\xa9"

enum { ANSWERS = 1, RAISES = 2, HAS_NO_IDENTIFIER = 3, LOSES_ITS_IDENTIFIER = 4, HAS_NO_RESPONSE = 5 };

static const wl_host* theHost;
static int timesAsked;

/* A text that no datagram holds, for as long as the process lives. */
static const char* longText(const char* begin) {
    const size_t length = 1000 * 1000;
    char* const text = malloc(length + 1);
    memset(text, 'x', length);
    memcpy(text, begin, strlen(begin));
    text[length] = '\0';
    return text;
}

static const char* identifier(wl_delegate* self, wl_error_slot* slot) {
    (void)self;
    ++timesAsked;
    switch (TEXT_PLUGIN) {
    case ANSWERS:
        return "com.corvid.answers\n<115>forged";
    case RAISES:
        return "com.corvid.raises";
    case HAS_NO_IDENTIFIER:
        theHost->raise(slot, longText("none" FORGERY));
        return NULL;
    case LOSES_ITS_IDENTIFIER:
        if (timesAsked > 1) {
            theHost->raise(slot, longText("lost" FORGERY));
            return NULL;
        }
        return "com.corvid.loses";
    default:
        return "com.corvid.waits\n<115>forged";
    }
}

static void complete(wl_delegate* self, const wl_value* response, wl_completion_handler handler,
                     wl_error_slot* slot) {
    (void)self;
    (void)response;
    if (TEXT_PLUGIN == ANSWERS) {
        handler.call(handler.context, false, 5, longText("failed" FORGERY));
    } else {
        theHost->raise(slot, longText("raised" FORGERY));
    }
}

static wl_delegate* create(const wl_host* host, wl_error_slot* slot) {
    static wl_delegate delegate = {
        .size = sizeof delegate, .delegate_identifier = identifier, .complete_setup_with_response = complete};
    (void)slot;
    theHost = host;
    return &delegate;
}

EXPORT_TEST_PLUGIN("Text" FORGERY);
