/* A plug-in that keeps to all rules, but for what its file has named before this. */

#ifndef IDENTIFIER
static const char* good_identifier(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    return "org.example.broken";
}
#define IDENTIFIER good_identifier
#endif

#ifndef REQUEST
static wl_value* good_request(wl_delegate* self, wl_error_slot* slot) {
    UNUSED(self, slot);
    wl_value* const request = host->new_dictionary();
    host->dictionary_set(request, "version", WL_NUL_TERMINATED, host->new_integer(1));
    return request;
}
#define REQUEST good_request
#endif

#ifndef COMPLETE
COMPLETION(good_completion) {
    UNUSED(self, response, slot);
    answer(handler);
}
#define COMPLETE good_completion
#endif

#ifndef TERMINATE
#define TERMINATE NULL
#endif
#ifndef COMPLETE_WITH_ALIASES
#define COMPLETE_WITH_ALIASES NULL
#endif
#ifndef OFFERED_ALIASES
#define OFFERED_ALIASES NULL
#endif
#ifndef EXTENSION
#define EXTENSION NULL
#endif
#ifndef INSTANCE_SIZE
#define INSTANCE_SIZE sizeof(wl_delegate)
#endif

static wl_delegate instance = {
    .size = INSTANCE_SIZE,
    .delegate_identifier = IDENTIFIER,
    .delegate_setup_request = REQUEST,
    .complete_setup_with_response = COMPLETE,
    .terminate_setup_completion = TERMINATE,
    .complete_setup_with_response_chosen_aliases = COMPLETE_WITH_ALIASES,
    .messaging_aliases_from_response = OFFERED_ALIASES,
    .get_extension = EXTENSION,
};

#ifndef CREATE
static wl_delegate* good_create(const wl_host* given, wl_error_slot* slot) {
    UNUSED(slot);
    host = given;
    return &instance;
}
#define CREATE good_create
#endif

#ifndef DESTROY
static void good_destroy(wl_delegate* self) {
    UNUSED(self);
}
#define DESTROY good_destroy
#endif

#ifndef ABI_VERSION
#define ABI_VERSION WL_DELEGATE_PLUGIN_ABI_VERSION
#endif
#ifndef DESCRIPTOR_SIZE
#define DESCRIPTOR_SIZE sizeof(wl_delegate_plugin_descriptor)
#endif
#ifndef PROTOCOL
#define PROTOCOL WL_DELEGATE_PLUGIN_PROTOCOL
#endif
#ifndef CLASS_NAME
#define CLASS_NAME "Broken"
#endif

#ifndef HAS_NO_SYMBOL
const wl_delegate_plugin_descriptor wl_delegate_plugin = {
    .abi_version = ABI_VERSION,
    .size = DESCRIPTOR_SIZE,
    .protocol = PROTOCOL,
    .class_name = CLASS_NAME,
    .create = CREATE,
    .destroy = DESTROY,
};
#endif
