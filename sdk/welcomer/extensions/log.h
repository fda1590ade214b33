/*
 * Lines of the system log, under the plug-in's name. C99 or later, and C++.
 *
 *     const wl_log* log = WL_HAS_MEMBER(host, get_extension) ? host->get_extension(WL_EXTENSION_LOG) : NULL;
 *     if (log) {
 *         log->write(self, WL_LOG_WARNING, "the cache is gone, starting with an empty one");
 *     }
 */

#ifndef WELCOMER_EXTENSIONS_LOG_H
#define WELCOMER_EXTENSIONS_LOG_H

#include <welcomer/delegate_plugin.h>

#ifdef __cplusplus
extern "C" {
#endif

#define WL_EXTENSION_LOG "com.corvid.welcomer.log/1"

/* How much it matters. Any other number counts as information. */
typedef int32_t wl_log_level;
enum { WL_LOG_ERROR = 0, WL_LOG_WARNING = 1, WL_LOG_INFORMATION = 2, WL_LOG_DEBUG = 3 };

/* Lives until the process ends. */
typedef struct wl_log {
    uint32_t size; /* in bytes, as the host knows this structure */

    /* Writes one line: "plug-in NAME warning: TEXT". The name is that of the plug-in's file. Control characters
     * are escaped, and what is longer than 1,024 bytes is cut.
     *  self  the delegate that speaks; null while there is none, in `create`: the plug-in then has its name only
     *        on the thread that is in `create`
     *  text  UTF-8, borrowed for the call; null writes nothing
     * Any thread. */
    void (*write)(wl_delegate* self, wl_log_level level, const char* text);
} wl_log;

#ifdef __cplusplus
}
#endif

#endif
