/* A plug-in that tries to build a request which no XML property list can hold. It raises when the host
 * refuses each of its values, and sends them when it does not. */

#include "tests/support/exported_plugin.h"

#include <math.h>

static const wl_host* the_host;

static const char* identifier(wl_delegate* self, wl_error_slot* slot) {
    (void)self;
    (void)slot;
    return "org.example.unwritable";
}

static wl_value* request(wl_delegate* self, wl_error_slot* slot) {
    (void)self;
    wl_value* const result = the_host->new_dictionary();
    wl_value* const values[] = {
        the_host->new_string("a\x01", WL_NUL_TERMINATED),
        the_host->new_string("\0", 1),
        the_host->new_date(1e15),
        the_host->new_date((double)NAN),
    };
    for (unsigned index = 0; index < sizeof values / sizeof *values; ++index) {
        if (values[index]) {
            the_host->dictionary_set(result, "value", WL_NUL_TERMINATED, values[index]);
        }
    }
    the_host->dictionary_set(result, "key\x02", WL_NUL_TERMINATED, the_host->new_boolean(true));
    if (the_host->count(result) == 0) {
        the_host->raise(slot, "all was refused");
    }
    return result;
}

static wl_delegate* create(const wl_host* host, wl_error_slot* slot) {
    static wl_delegate delegate = {
        .size = sizeof delegate, .delegate_identifier = identifier, .delegate_setup_request = request};
    (void)slot;
    the_host = host;
    return &delegate;
}

EXPORT_TEST_PLUGIN("UnwritablePlugin");
