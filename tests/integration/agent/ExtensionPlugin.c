/* A plug-in in C that uses everything a host offers beyond its first table, and says in the log what it saw. */

#define _GNU_SOURCE /* gettid */

#include "tests/support/exported_plugin.h"

#include <welcomer/extensions/context.h>
#include <welcomer/extensions/dispatch.h>
#include <welcomer/extensions/log.h>
#include <welcomer/extensions/progress.h>

#include <math.h>
#include <pthread.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

static const wl_log* lines;
static const wl_context* context;
static const wl_progress* progress;
static const wl_dispatch* loop;
static wl_completion_handler handler;
static wl_delegate delegate;
static uint64_t later;

static void tell(const char* text) {
    lines->write(&delegate, WL_LOG_INFORMATION, text);
}

static const char* text_or_none(const char* text) {
    return text ? text : "(none)";
}

static void dropped(void* data) {
    char text[64];
    snprintf(text, sizeof text, "dropped: %s", (const char*)data);
    tell(text);
}

static void finish(void* data) {
    char text[64];
    snprintf(text, sizeof text, "%s on the %s", (const char*)data,
             gettid() == getpid() ? "main thread" : "wrong thread");
    tell(text);
    tell(loop->cancel(&delegate, later) ? "cancelled" : "too late");
    tell(loop->cancel(&delegate, later) ? "cancelled twice" : "not cancelled twice");
    progress->report(&delegate, 7, "done");
    handler.call(handler.context, true, 0, NULL);
}

static void first(void* data) {
    tell(data);
}

static void* on_own_thread(void* unused) {
    lines->write(NULL, WL_LOG_WARNING, "nobody knows whose");
    lines->write(&delegate, 99, "on a thread\nof its own");
    return unused;
}

static const char* identifier(wl_delegate* self, wl_error_slot* slot) {
    (void)self;
    (void)slot;
    return "org.example.extended";
}

static void complete(wl_delegate* self, const wl_value* response, wl_completion_handler given,
                     wl_error_slot* slot) {
    (void)response;
    (void)slot;
    static char text[512];
    handler = given;
    snprintf(text, sizeof text, "account %s, home %s, root %s, %s, version %s",
             text_or_none(context->account_name()), text_or_none(context->home_folder()),
             context->root_folder(), context->is_trial() ? "trial" : "real", context->host_version());
    lines->write(self, WL_LOG_DEBUG, text);
    lines->write(self, WL_LOG_ERROR, NULL);
    pthread_t thread;
    pthread_create(&thread, NULL, on_own_thread, NULL);
    pthread_join(thread, NULL);
    progress->report(self, -1, NULL);
    progress->report(self, 0.405, "copying");
    progress->report(self, 0.409, "copying");
    progress->report(self, NAN, "copying");
    progress->report(NULL, 0.5, "nobody");
    later = loop->after(self, 60, first, dropped, (void*)"later");
    loop->after(self, 0.2, finish, dropped, (void*)"after a while");
    loop->after(self, 0, first, NULL, (void*)"at once");
    loop->after(self, 60, first, dropped, (void*)"never dropped nor run");
    if (loop->after(NULL, 0, first, NULL, (void*)"nobody's") || loop->after(self, 0, NULL, dropped, NULL)) {
        tell("taken all the same");
    }
}

static wl_delegate* create(const wl_host* host, wl_error_slot* slot) {
    (void)slot;
    if (!WL_HAS_MEMBER(host, get_extension) || host->get_extension("org.example.none") ||
        host->get_extension(NULL)) {
        return NULL;
    }
    lines = host->get_extension(WL_EXTENSION_LOG);
    context = host->get_extension(WL_EXTENSION_CONTEXT);
    progress = host->get_extension(WL_EXTENSION_PROGRESS);
    loop = host->get_extension(WL_EXTENSION_DISPATCH);
    if (!lines || !context || !progress || !loop) {
        return NULL;
    }
    lines->write(NULL, WL_LOG_WARNING, "being made");
    delegate.size = sizeof delegate;
    delegate.delegate_identifier = identifier;
    delegate.complete_setup_with_response = complete;
    return &delegate;
}

EXPORT_TEST_PLUGIN("ExtensionPlugin");
