/* Forks. */

#include "plugin.h"

#include <sys/wait.h>

COMPLETION(complete) {
    UNUSED(self, response, slot);
    const pid_t child = fork();
    if (child == 0) {
        _exit(0);
    }
    waitpid(child, NULL, 0);
    answer(handler);
}
#define COMPLETE complete

#include "whole.h"
