/*
 * Whom the setup is for, and where. C99 or later, and C++.
 */

#ifndef WELCOMER_EXTENSIONS_CONTEXT_H
#define WELCOMER_EXTENSIONS_CONTEXT_H

#include <welcomer/delegate_plugin.h>

#ifdef __cplusplus
extern "C" {
#endif

#define WL_EXTENSION_CONTEXT "com.corvid.welcomer.context/1"

/* Lives until the process ends, and so does every text that it gives. Any thread; the agent knows all of it
 * before the first plug-in is loaded. */
typedef struct wl_context {
    uint32_t size; /* in bytes, as the host knows this structure */

    /* The cloud account's user name, or null where nobody has begun to sign in: while the plug-ins are only
     * listed, for instance. */
    const char* (*account_name)(void);

    /* The home folder of the user whose setup this is: a path of the system. Null for a user without one. */
    const char* (*home_folder)(void);

    /* The folder below which the system's files are looked up: "/" on a real machine, another one in a trial. A
     * file of the system is at the root and its path, one behind the other. */
    const char* (*root_folder)(void);

    /* Whether this is a trial, on a machine that is made up: nothing outside of the root folder is to change. */
    bool (*is_trial)(void);

    /* The host's version, such as "1.4.0". */
    const char* (*host_version)(void);
} wl_context;

#ifdef __cplusplus
}
#endif

#endif
