/* A plug-in whose identifier stands in the file as it is, so that a thousand different plug-ins are copies of
 * one file with other digits. */

#include <welcomer/delegate_plugin.h>

static const char identifier[] = "com.corvid.bench.number0000";

static const char* delegate_identifier(wl_delegate* self, wl_error_slot* slot) {
    (void)self;
    (void)slot;
    return identifier;
}

static wl_value* delegate_setup_request(wl_delegate* self, wl_error_slot* slot) {
    (void)self;
    (void)slot;
    return NULL;
}

static void complete_setup_with_response(wl_delegate* self, const wl_value* response,
                                         wl_completion_handler handler, wl_error_slot* slot) {
    (void)self;
    (void)response;
    (void)slot;
    handler.call(handler.context, true, 0, NULL);
}

static wl_delegate instance = {
    .size = sizeof(wl_delegate),
    .delegate_identifier = delegate_identifier,
    .delegate_setup_request = delegate_setup_request,
    .complete_setup_with_response = complete_setup_with_response,
};

static wl_delegate* create(const wl_host* host, wl_error_slot* slot) {
    (void)host;
    (void)slot;
    return &instance;
}

static void destroy(wl_delegate* self) {
    (void)self;
}

const wl_delegate_plugin_descriptor wl_delegate_plugin = {
    .abi_version = WL_DELEGATE_PLUGIN_ABI_VERSION,
    .size = sizeof(wl_delegate_plugin_descriptor),
    .protocol = WL_DELEGATE_PLUGIN_PROTOCOL,
    .class_name = "NumberedPlugin",
    .create = create,
    .destroy = destroy,
};
