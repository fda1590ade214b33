/* Delegates that run GLib's default main context on threads of their own, which the main thread owns. Each
 * tells the system log when its loop has come back. Which one this is, says OWN_LOOP when it is compiled: 1
 * a thread runs the loop from `create` on; a timer attached by the completion calls the handler 2  the
 * completion starts a thread that runs the loop, and another one that calls the handler a second later 3  the
 * completion starts a thread that calls the handler and then iterates the context for ever 4  the completion
 * starts a thread that runs the loop; a timer in it ends the loop, and that thread then calls the handler */

#define _GNU_SOURCE /* syscall */

#include <welcomer/delegate_plugin.h>

#include <glib.h>
#include <pthread.h>
#include <sys/syscall.h>
#include <syslog.h>
#include <unistd.h>

#define TEXT_OF(number) #number
#define IDENTIFIER_OF(number) "com.corvid.loop" TEXT_OF(number)
#define IDENTIFIER IDENTIFIER_OF(OWN_LOOP)

static wl_delegate delegate;
static wl_completion_handler handler;
static GMainLoop* loop;

static void start(void* (*function)(void*)) {
    pthread_t thread;
    pthread_create(&thread, NULL, function, NULL);
    pthread_detach(thread);
}

static void call_handler(void) {
    handler.call(handler.context, true, 0, NULL);
}

static gboolean on_main_thread(void) {
    return syscall(SYS_gettid) == getpid();
}

static void* run_loop(void* unused) {
    (void)unused;
    g_main_loop_run(loop);
    syslog(LOG_ERR, IDENTIFIER ": the loop has ended");
    if (OWN_LOOP == 4) {
        call_handler();
    }
    return NULL;
}

static gboolean timer(gpointer unused) {
    (void)unused;
    if (!g_main_loop_is_running(loop)) {
        return G_SOURCE_CONTINUE; /* its thread has not got that far */
    }
    syslog(LOG_ERR, IDENTIFIER ": a timer on %s", on_main_thread() ? "the main thread" : "another thread");
    if (OWN_LOOP == 1) {
        call_handler();
    } else {
        g_main_loop_quit(loop);
    }
    return G_SOURCE_REMOVE;
}

static void* wait_and_call(void* unused) {
    (void)unused;
    g_usleep(G_USEC_PER_SEC);
    call_handler();
    return NULL;
}

static void* call_and_iterate(void* unused) {
    (void)unused;
    call_handler();
    for (;;) {
        g_main_context_iteration(NULL, TRUE);
    }
    return NULL;
}

static const char* delegate_identifier(wl_delegate* self, wl_error_slot* slot) {
    (void)self;
    (void)slot;
    return IDENTIFIER;
}

static wl_value* delegate_setup_request(wl_delegate* self, wl_error_slot* slot) {
    (void)self;
    (void)slot;
    return NULL;
}

static void complete_setup(wl_delegate* self, const wl_value* response, wl_completion_handler given,
                           wl_error_slot* slot) {
    (void)self;
    (void)response;
    (void)slot;
    handler = given;
    if (OWN_LOOP == 1 || OWN_LOOP == 4) {
        g_timeout_add_seconds(1, timer, NULL);
    }
    if (OWN_LOOP == 2 || OWN_LOOP == 4) {
        start(run_loop);
    }
    if (OWN_LOOP == 2 || OWN_LOOP == 3) {
        start(OWN_LOOP == 2 ? wait_and_call : call_and_iterate);
    }
}

static wl_delegate* create(const wl_host* host, wl_error_slot* slot) {
    (void)host;
    (void)slot;
    delegate.size = sizeof delegate;
    delegate.delegate_identifier = delegate_identifier;
    delegate.delegate_setup_request = delegate_setup_request;
    delegate.complete_setup_with_response = complete_setup;
    loop = g_main_loop_new(NULL, FALSE);
    if (OWN_LOOP == 1) {
        start(run_loop);
        while (!g_main_loop_is_running(loop)) {
            g_usleep(1000); /* the loop is there before anything else */
        }
    }
    return &delegate;
}

const wl_delegate_plugin_descriptor wl_delegate_plugin = {
    WL_DELEGATE_PLUGIN_ABI_VERSION,
    sizeof(wl_delegate_plugin_descriptor),
    WL_DELEGATE_PLUGIN_PROTOCOL,
    "LoopRunner",
    create,
    NULL,
};
