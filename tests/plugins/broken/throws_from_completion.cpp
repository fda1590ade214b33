// Throws a number across the boundary in place of an answer.

#include <welcomer/delegate_plugin.h>

static const char* identifier(wl_delegate*, wl_error_slot*) {
    return "org.example.broken";
}

static wl_value* request(wl_delegate*, wl_error_slot*) {
    return nullptr;
}

static void complete(wl_delegate*, const wl_value*, wl_completion_handler, wl_error_slot*) {
    throw 42;
}

static wl_delegate instance{
    sizeof(wl_delegate), nullptr, identifier, request, complete, nullptr, nullptr, nullptr, nullptr};

static wl_delegate* create(const wl_host*, wl_error_slot*) {
    return &instance;
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
