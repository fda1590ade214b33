// Throws across the boundary when an instance is to be made.

#include <welcomer/delegate_plugin.h>

#include <stdexcept>

static wl_delegate* create(const wl_host*, wl_error_slot*) {
    throw std::runtime_error("no such table");
}

static void destroy(wl_delegate*) {}

extern "C" {
const wl_delegate_plugin_descriptor wl_delegate_plugin = {WL_DELEGATE_PLUGIN_ABI_VERSION,
                                                          sizeof(wl_delegate_plugin_descriptor),
                                                          WL_DELEGATE_PLUGIN_PROTOCOL,
                                                          "Throwing",
                                                          create,
                                                          destroy};
}
