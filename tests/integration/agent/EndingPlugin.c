/* A plug-in that ends its process. The environment's ENDING says where and how: "create abort", for example.
 */

#define _GNU_SOURCE

#include "tests/support/exported_plugin.h"

#include <limits.h>
#include <pthread.h>
#include <signal.h>
#include <stdlib.h>
#include <string.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

static const struct {
    const char* name;
    int number;
} signals[] = {{"SIGABRT", SIGABRT}, {"SIGBUS", SIGBUS}, {"SIGFPE", SIGFPE},  {"SIGILL", SIGILL},
               {"SIGSEGV", SIGSEGV}, {"SIGSYS", SIGSYS}, {"SIGTRAP", SIGTRAP}};

/* Every call takes a piece of the stack that the one before still needs. */
static int overflow(int depth) {
    volatile char piece[4096];
    piece[0] = (char)depth;
    return depth == 0 ? 0 : overflow(depth - 1) + piece[0];
}

static void* fault(void* barrier) {
    if (barrier) {
        pthread_barrier_wait(barrier);
    }
    *(volatile int*)NULL = 0;
    return NULL;
}

static void* leave(void* unused) {
    exit(7);
    return unused;
}

static void* overflow_thread(void* unused) {
    overflow(INT_MAX);
    return unused;
}

static void run_thread(void* (*function)(void*), void* argument, pthread_t* thread) {
    pthread_create(thread, NULL, function, argument);
}

static void two_at_once(void) {
    pthread_barrier_t barrier;
    pthread_t threads[2];
    pthread_barrier_init(&barrier, NULL, 2);
    run_thread(fault, &barrier, &threads[0]);
    run_thread(fault, &barrier, &threads[1]);
    pthread_join(threads[0], NULL);
}

static int status_of(pid_t child) {
    int status = 0;
    waitpid(child, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : WTERMSIG(status);
}

/* Children end as they always did; 5 and 11 then become 61. */
static void fork_two(void) {
    pid_t child = fork();
    if (child == 0) {
        exit(5);
    }
    int status = status_of(child);
    child = fork();
    if (child == 0) {
        fault(NULL);
    }
    exit(10 * status + status_of(child));
}

/* Every descriptor is in use when the process ends. */
static void use_up_descriptors(void) {
    const struct rlimit few = {32, 32};
    setrlimit(RLIMIT_NOFILE, &few);
    while (dup(STDOUT_FILENO) >= 0) {
    }
    abort();
}

static void end_by(const char* how) {
    pthread_t thread;
    if (strcmp(how, "exit") == 0) {
        exit(7);
    } else if (strcmp(how, "quick_exit") == 0) {
        quick_exit(7);
    } else if (strcmp(how, "fault") == 0) {
        fault(NULL);
    } else if (strcmp(how, "overflow") == 0) {
        overflow(INT_MAX);
    } else if (strcmp(how, "thread-exit") == 0) {
        run_thread(leave, NULL, &thread);
        pthread_join(thread, NULL);
    } else if (strcmp(how, "thread-fault") == 0) {
        run_thread(fault, NULL, &thread);
        pthread_join(thread, NULL);
    } else if (strcmp(how, "thread-overflow") == 0) {
        run_thread(overflow_thread, NULL, &thread);
        pthread_join(thread, NULL);
    } else if (strcmp(how, "_exit") == 0) {
        _exit(7);
    } else if (strcmp(how, "two-at-once") == 0) {
        two_at_once();
    } else if (strcmp(how, "fork") == 0) {
        fork_two();
    } else if (strcmp(how, "descriptors") == 0) {
        use_up_descriptors();
    }
    for (size_t index = 0; index < sizeof signals / sizeof *signals; ++index) {
        if (strcmp(how, signals[index].name) == 0) {
            raise(signals[index].number);
        }
    }
}

static void end_at(const char* where) {
    const char* const wanted = getenv("ENDING");
    const size_t length = strlen(where);
    if (wanted && strncmp(wanted, where, length) == 0 && wanted[length] == ' ') {
        end_by(wanted + length + 1);
    }
}

__attribute__((constructor)) static void initialise(void) {
    end_at("load");
}

static const char* identifier(wl_delegate* self, wl_error_slot* slot) {
    (void)self;
    (void)slot;
    end_at("identify");
    return "org.example.ending";
}

static void complete(wl_delegate* self, const wl_value* response, wl_completion_handler handler,
                     wl_error_slot* slot) {
    (void)self;
    (void)response;
    (void)slot;
    end_at("complete");
    handler.call(handler.context, true, 0, NULL);
}

static wl_delegate* create(const wl_host* host, wl_error_slot* slot) {
    static wl_delegate delegate = {
        .size = sizeof delegate, .delegate_identifier = identifier, .complete_setup_with_response = complete};
    (void)host;
    (void)slot;
    end_at("create");
    return &delegate;
}

EXPORT_TEST_PLUGIN("EndingPlugin");
