#include "tools/welcomer/cli/StandardOutputGuard.h"

#include <cstdio>
#include <fcntl.h>
#include <iostream>
#include <unistd.h>

namespace welcomer::tool {

StandardOutputGuard::StandardOutputGuard() : _real(fcntl(STDOUT_FILENO, F_DUPFD_CLOEXEC, 3)) {
    std::cout.flush();
    dup2(STDERR_FILENO, STDOUT_FILENO);
}

StandardOutputGuard::~StandardOutputGuard() {
    std::fflush(stdout);
    if (_real >= 0) {
        dup2(_real, STDOUT_FILENO);
        close(_real);
    }
}

} // namespace welcomer::tool
