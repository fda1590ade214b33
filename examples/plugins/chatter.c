/* The messaging delegate, in plain C: it registers the addresses that the user chose, on the calling thread.
 */

#define _POSIX_C_SOURCE 200809L /* nanosleep */

#include <welcomer/delegate_plugin.h>

#include <stdlib.h>
#include <time.h>

/* What create makes. The structure that crosses points back to it. */
struct chatter {
    wl_delegate interface;
    const wl_host* host;
};

static const struct chatter* chatter_of(const wl_delegate* self) {
    return self->plugin_data;
}

static const char* delegate_identifier(wl_delegate* self, wl_error_slot* slot) {
    (void)self;
    (void)slot;
    return "com.corvid.chatter";
}

static wl_value* delegate_setup_request(wl_delegate* self, wl_error_slot* slot) {
    const wl_host* host = chatter_of(self)->host;
    wl_value* request = host->new_dictionary();
    if (!host->dictionary_set(request, "wantsAliases", WL_NUL_TERMINATED, host->new_boolean(true))) {
        host->release(request);
        host->raise(slot, "out of memory");
        return NULL;
    }
    return request;
}

/* Waits as long as the server asks; long enough to be seen when it says nothing. */
static void work(const wl_host* host, const wl_value* response) {
    const wl_value* wanted = host->dictionary_get(response, "delaySeconds", WL_NUL_TERMINATED);
    double seconds = 0.02;
    int64_t whole = 0;
    if (!host->get_real(wanted, &seconds) && host->get_integer(wanted, &whole)) {
        seconds = (double)whole;
    }
    if (seconds > 0 && seconds < 3600) {
        struct timespec duration;
        duration.tv_sec = (time_t)seconds;
        duration.tv_nsec = (long)((seconds - (double)duration.tv_sec) * 1e9);
        nanosleep(&duration, NULL);
    }
}

static void complete_chosen_aliases(wl_delegate* self, const wl_value* response, const wl_value* aliases,
                                    wl_completion_handler handler, wl_error_slot* slot) {
    const wl_host* host = chatter_of(self)->host;
    (void)slot;
    if (host->value_type(response) != WL_VALUE_DICTIONARY) {
        handler.call(handler.context, false, 0, "the response is no dictionary");
        return;
    }
    for (size_t index = 0; index < host->count(aliases); ++index) {
        size_t length = 0;
        if (!host->get_string(host->array_at(aliases, index), &length) || length == 0) {
            handler.call(handler.context, false, 0, "an alias is empty");
            return;
        }
    }
    work(host, response);
    handler.call(handler.context, true, 0, NULL);
}

static void complete(wl_delegate* self, const wl_value* response, wl_completion_handler handler,
                     wl_error_slot* slot) {
    complete_chosen_aliases(self, response, NULL, handler, slot);
}

static wl_value* messaging_aliases(wl_delegate* self, const wl_value* response, wl_error_slot* slot) {
    const wl_host* host = chatter_of(self)->host;
    const wl_value* offered = host->dictionary_get(response, "aliases", WL_NUL_TERMINATED);
    if (host->value_type(offered) != WL_VALUE_ARRAY) {
        return NULL;
    }
    wl_value* aliases = host->copy(offered);
    if (!aliases) {
        host->raise(slot, "out of memory");
    }
    return aliases;
}

static wl_delegate* create(const wl_host* host, wl_error_slot* slot) {
    struct chatter* chatter = calloc(1, sizeof *chatter);
    if (!chatter) {
        host->raise(slot, "out of memory");
        return NULL;
    }
    chatter->host = host;
    chatter->interface.size = sizeof chatter->interface;
    chatter->interface.plugin_data = chatter;
    chatter->interface.delegate_identifier = delegate_identifier;
    chatter->interface.delegate_setup_request = delegate_setup_request;
    chatter->interface.complete_setup_with_response = complete;
    chatter->interface.complete_setup_with_response_chosen_aliases = complete_chosen_aliases;
    chatter->interface.messaging_aliases_from_response = messaging_aliases;
    return &chatter->interface;
}

static void destroy(wl_delegate* self) {
    if (self) {
        free(self->plugin_data);
    }
}

const wl_delegate_plugin_descriptor wl_delegate_plugin = {
    .abi_version = WL_DELEGATE_PLUGIN_ABI_VERSION,
    .size = sizeof(wl_delegate_plugin_descriptor),
    .protocol = WL_DELEGATE_PLUGIN_PROTOCOL,
    .class_name = "Chatter",
    .create = create,
    .destroy = destroy,
};
