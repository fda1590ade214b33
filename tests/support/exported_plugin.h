/* The end of every plug-in in C that a test brings. */

#pragma once

#include <welcomer/delegate_plugin.h>

/* Exports the plug-in of a file, which has a function create(); its one instance needs no destroying. */
#define EXPORT_TEST_PLUGIN(name)                                                                             \
    static void destroy(wl_delegate* self) {                                                                 \
        (void)self;                                                                                          \
    }                                                                                                        \
    const wl_delegate_plugin_descriptor wl_delegate_plugin = {                                               \
        .abi_version = WL_DELEGATE_PLUGIN_ABI_VERSION,                                                       \
        .size = sizeof wl_delegate_plugin,                                                                   \
        .protocol = WL_DELEGATE_PLUGIN_PROTOCOL,                                                             \
        .class_name = name,                                                                                  \
        .create = create,                                                                                    \
        .destroy = destroy,                                                                                  \
    }
