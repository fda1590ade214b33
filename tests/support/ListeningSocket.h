// A Unix socket of a test's own.

#pragma once

#include "backends/posix/FileDescriptor.h"

#include <cstring>
#include <stdexcept>
#include <string>
#include <sys/socket.h>
#include <sys/un.h>

namespace welcomer {

// Makes a socket at a path and listens on it.
inline posix::FileDescriptor listenOn(const std::string& path) {
    posix::FileDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    std::strncpy(address.sun_path, path.c_str(), sizeof(address.sun_path) - 1);
    if (::bind(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0 ||
        ::listen(socket.get(), 64) != 0) {
        throw std::runtime_error("cannot listen on " + path);
    }
    return socket;
}

} // namespace welcomer
