/*
 * Blocks on the host's main loop. C99 or later, and C++.
 */

#ifndef WELCOMER_EXTENSIONS_DISPATCH_H
#define WELCOMER_EXTENSIONS_DISPATCH_H

#include <welcomer/delegate_plugin.h>

#ifdef __cplusplus
extern "C" {
#endif

#define WL_EXTENSION_DISPATCH "com.corvid.welcomer.dispatch/1"

/* Lives until the process ends. */
typedef struct wl_dispatch {
    uint32_t size; /* in bytes, as the host knows this structure */

    /* Has a block run on the main loop, whose thread is the one that scanned for plug-ins: in the agent the main
     * thread, which runs it while it waits for the delegates and while it lingers. Everybody waits for a block: it
     * is to be short. What it throws is logged and goes no further. Blocks of one delay run in the order of the
     * calls.
     *  self     the delegate; null, and one that the host does not know, is refused
     *  seconds  before which it does not run; not above 0 is at once, but never within this call
     *  block    what runs, at most once
     *  drop     called in its place when it will not run: on the thread that cancels it, or that ends the delegate.
     *           Null for nothing
     *  data     for both; the plug-in's own
     *  result   a number for `cancel`; 0 where it is refused, and neither is called
     * What has not run when the process ends is not run, and not dropped either. Any thread. */
    uint64_t (*after)(wl_delegate* self, double seconds, void (*block)(void* data), void (*drop)(void* data),
                      void* data);

    /* Has a block not run.
     *  result  whether it will not: false for one that has begun, or that is none of this delegate's
     * Any thread, also from within a block. */
    bool (*cancel)(wl_delegate* self, uint64_t number);
} wl_dispatch;

#ifdef __cplusplus
}
#endif

#endif
