// The last words of a process that somebody else's code ends. Only programs include this.

#pragma once

namespace welcomer {

// What there is to know for the last words. Signal handlers ask it.
struct UnexpectedEndOptions {
    // The record's facility and severity, as syslog(3) takes them.
    int priority = 0;

    // Gives the name of the plug-in that the calling thread is in, or null. Must be safe in a signal handler.
    const char* (*currentPlugin)() noexcept = nullptr;
};

// From now on this process ends with status 0 and one record in the system log
//     ended by plug-in NAME: WHAT
//     ended outside of any call into a plug-in: WHAT
// when a signal tells of a fault in it (SIGABRT, SIGBUS, SIGFPE, SIGILL, SIGSEGV, SIGSYS, SIGTRAP), when an
// exception is caught by nobody, and when exit() or quick_exit() is called, on any thread. The owner's own
// way out is _exit(), which says nothing. A process that is forked off ends as it would without this. The
// signals by which somebody ends a process stay as they are; those of a broken pipe and of a file that grows
// too long (SIGPIPE, SIGXFSZ) are ignored, so that the call that met it fails.
//
// An overflow of the stack is told of on the main thread and on those of the local queues, which have a
// second one (AlternateStack); on a thread of a plug-in's own it still ends the process by its signal.
//
// Main thread, once, before there is another.
void reportUnexpectedEnd(const UnexpectedEndOptions& options);

} // namespace welcomer
