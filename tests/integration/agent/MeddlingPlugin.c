/* A plug-in that meddles with others. Which one it is, says the file's name:
 *   guesser   calls handlers whose contexts it guesses, before its own
 *   changer   has another one's identifier once it is loaded
 *   victim    has an outcome that no other has: an error of its own, once the guesser has guessed
 *   silent    keeps its handler for ever
 * The response of guesser and victim names the file that the guesser makes when it is done; another one beside it, which
 * the victim makes, tells the guesser that there is a handler to be guessed. */

#define _GNU_SOURCE /* dladdr */

#include "tests/support/exported_plugin.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <limits.h>
#include <pthread.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#define GUESSES 100000u
#define WAITS 3000 /* of 10 ms each */

static const wl_host* host;
static wl_completion_handler handler;
static char role[32];
static char path[PATH_MAX];
static char victims_path[PATH_MAX + 8];
static int times_asked;

static bool is(const char* name) {
    return strcmp(role, name) == 0;
}

static void find_role(void) {
    Dl_info library;
    if (!dladdr(&host, &library)) {
        return;
    }
    const char* const slash = strrchr(library.dli_fname, '/');
    sscanf(slash ? slash + 1 : library.dli_fname, "%31[a-z]", role);
}

static void make(const char* name) {
    close(open(name, O_WRONLY | O_CREAT, 0600));
}

static void wait_for(const char* name) {
    for (int waits = 0; waits < WAITS && access(name, F_OK) != 0; ++waits) {
        usleep(10 * 1000);
    }
}

static void guess(void) {
    wait_for(victims_path);
    for (uint64_t context = 1; context <= GUESSES; ++context) {
        const uint64_t guesses[] = {context, handler.context - context, handler.context + context};
        for (size_t index = 0; index < sizeof guesses / sizeof *guesses; ++index) {
            if (guesses[index] != handler.context) {
                handler.call(guesses[index], true, 0, NULL);
            }
        }
    }
    make(path);
    handler.call(handler.context, true, 0, NULL);
}

static void* answer_late(void* unused) {
    wait_for(path);
    handler.call(handler.context, false, 0, "the victim's own outcome");
    return unused;
}

static const char* identifier(wl_delegate* self, wl_error_slot* slot) {
    (void)self;
    (void)slot;
    static char text[64];
    ++times_asked;
    snprintf(text, sizeof text, "org.example.%s", is("changer") && times_asked > 1 ? "victim" : role);
    return text;
}

static void complete(wl_delegate* self, const wl_value* response, wl_completion_handler given,
                     wl_error_slot* slot) {
    (void)self;
    (void)slot;
    handler = given;
    const char* const given_path = host->get_string(response, NULL);
    snprintf(path, sizeof path, "%s", given_path ? given_path : "");
    snprintf(victims_path, sizeof victims_path, "%s.victim", path);
    pthread_t thread;
    if (is("guesser")) {
        guess();
    } else if (is("victim")) {
        make(victims_path);
        pthread_create(&thread, NULL, answer_late, NULL);
        pthread_detach(thread);
    } else if (!is("silent")) {
        handler.call(handler.context, true, 0, NULL);
    }
}

static wl_delegate* create(const wl_host* table, wl_error_slot* slot) {
    static wl_delegate delegate = {
        .size = sizeof delegate, .delegate_identifier = identifier, .complete_setup_with_response = complete};
    (void)slot;
    host = table;
    find_role();
    return &delegate;
}

EXPORT_TEST_PLUGIN("MeddlingPlugin");
