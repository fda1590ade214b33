// The sockets that the service manager has opened for the server.

#pragma once

#include "backends/posix/FileDescriptor.h"

#include <string>
#include <vector>

namespace welcomer::server {

struct ListeningSocket {
    enum class Use {
        Clear, // without encryption: what comes does not leave the machine
        Tls,
        Metrics,
    };
    posix::FileDescriptor socket;
    std::string name;  // that the service manager gives it
    std::string shown; // its address, for people
    bool isUnix = false;
    bool isLocal = false; // nobody outside this machine reaches it
};

// Takes the sockets that were handed over. Throws std::runtime_error with one line when there is none, or one
// that is no listening stream socket. Once, on the main thread.
std::vector<ListeningSocket> takeListeningSockets();

// Opens a Unix socket of the caller's own, for nobody else, in the place of one that an earlier server has left there. Throws
// std::runtime_error with one line. Main thread, no other thread running.
//  path  of this machine
std::vector<ListeningSocket> openListeningSocket(const std::string& path);

// What a socket serves. Throws std::runtime_error with one line where the socket is not to be served so:
// passwords in the clear stay on this machine.
//  hasCertificate  whether there is one to show
ListeningSocket::Use useOf(const ListeningSocket& socket, bool hasCertificate);

} // namespace welcomer::server
