/*
 * How far a setup has come, while it runs. C99 or later, and C++.
 */

#ifndef WELCOMER_EXTENSIONS_PROGRESS_H
#define WELCOMER_EXTENSIONS_PROGRESS_H

#include <welcomer/delegate_plugin.h>

#ifdef __cplusplus
extern "C" {
#endif

#define WL_EXTENSION_PROGRESS "com.corvid.welcomer.progress/1"

/* Lives until the process ends. */
typedef struct wl_progress {
    uint32_t size; /* in bytes, as the host knows this structure */

    /* Says how far the delegate has come, for people who wait: it shows where the login is watched, and in the
     * system log as one line, "IDENTIFIER progress: 40 % copying". What says the same as before, in whole percent,
     * says nothing, nor does more than 200 lines of one delegate in one process. It does not end the setup: the
     * handler does.
     *  self      the delegate; null, and one that the host does not know, says nothing
     *  fraction  from 0 to 1; what is below or above counts as the nearest of these, and what is no number as 0
     *  text      UTF-8, one line for people, borrowed for the call; null for none
     * Any thread. */
    void (*report)(wl_delegate* self, double fraction, const char* text);
} wl_progress;

#ifdef __cplusplus
}
#endif

#endif
