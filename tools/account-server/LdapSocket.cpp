#include "tools/account-server/LdapSocket.h"

#include <cerrno>
#include <condition_variable>
#include <fcntl.h>
#include <memory>
#include <mutex>
#include <netdb.h>
#include <poll.h>
#include <stop_token>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/un.h>

namespace welcomer::server {

namespace {

posix::FileDescriptor connectTo(const sockaddr* address, socklen_t length, std::chrono::seconds limit) {
    posix::FileDescriptor connection(
        ::socket(address->sa_family, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    int error = ::connect(connection.get(), address, length) == 0 ? 0 : errno;
    if (error == EINPROGRESS) {
        pollfd waiting{connection.get(), POLLOUT, 0};
        const int milliseconds = static_cast<int>(std::chrono::milliseconds(limit).count());
        socklen_t size = sizeof error;
        if (::poll(&waiting, 1, milliseconds) <= 0) {
            error = ETIMEDOUT;
        } else if (::getsockopt(connection.get(), SOL_SOCKET, SO_ERROR, &error, &size) != 0) {
            error = errno;
        }
    }
    if (error != 0) {
        errno = error;
        return posix::FileDescriptor();
    }
    // libldap wants to wait in its reads, and asks without a pause otherwise.
    ::fcntl(connection.get(), F_SETFL, ::fcntl(connection.get(), F_GETFL) & ~O_NONBLOCK);
    const timeval time{static_cast<time_t>(limit.count()), 0};
    for (const int option : {SO_RCVTIMEO, SO_SNDTIMEO}) {
        ::setsockopt(connection.get(), SOL_SOCKET, option, &time, sizeof time);
    }
    return connection;
}

} // namespace

posix::FileDescriptor connectWithin(const std::string& host, int port, std::chrono::seconds limit) {
    if (host.starts_with('/')) {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        host.copy(address.sun_path, sizeof address.sun_path - 1);
        return connectTo(reinterpret_cast<const sockaddr*>(&address), sizeof address, limit);
    }
    addrinfo hints{};
    hints.ai_socktype = SOCK_STREAM;
    addrinfo* found = nullptr;
    if (::getaddrinfo(host.c_str(), std::to_string(port).c_str(), &hints, &found) != 0) {
        errno = EHOSTUNREACH;
        return posix::FileDescriptor();
    }
    const std::unique_ptr<addrinfo, decltype(&::freeaddrinfo)> addresses(found, &::freeaddrinfo);
    posix::FileDescriptor connection;
    for (const addrinfo* each = addresses.get(); each && !connection; each = each->ai_next) {
        connection = connectTo(each->ai_addr, each->ai_addrlen, limit);
    }
    return connection;
}

BrokenOffAfter::BrokenOffAfter(int socket, std::chrono::seconds limit)
    : _watch([socket, limit](const std::stop_token& isDone) {
          std::mutex mutex;
          std::unique_lock lock(mutex);
          std::condition_variable_any never;
          never.wait_for(lock, isDone, limit, [] { return false; });
          if (!isDone.stop_requested()) {
              ::shutdown(socket, SHUT_RDWR);
          }
      }) {}

} // namespace welcomer::server
