#include "backends/posix/NetlinkSocket.h"

#include "backends/posix/Libmnl.h"

#include <cerrno>
#include <sys/socket.h>
#include <sys/time.h>

namespace welcomer::posix {

namespace {

constexpr std::size_t kBufferSize = std::size_t{64} * 1024; // the kernel fills no more than half of it
constexpr int kMaximumListings = 10;
constexpr timeval kPatience{10, 0}; // the kernel answers at once

int showMessage(const nlmsghdr* message, void* take) {
    (*static_cast<const NetlinkSocket::Take*>(take))(*message);
    return MNL_CB_OK;
}

} // namespace

void NetlinkSocket::Close::operator()(mnl_socket* socket) const {
    libmnl().socketClose(socket);
}

int NetlinkSocket::ask(NetlinkRequest& request, const Take& take) {
    request.message().nlmsg_flags |= NLM_F_ACK; // which ends the answer
    return _exchange(request.message(), take);
}

int NetlinkSocket::list(NetlinkRequest& request, const std::function<void()>& begin, const Take& take) {
    int error = EINTR;
    for (int listing = 0; error == EINTR && listing < kMaximumListings; ++listing) {
        begin();
        error = _exchange(request.message(), take);
    }
    return error;
}

int NetlinkSocket::_exchange(nlmsghdr& request, const Take& take) {
    if (const int error = _open()) {
        return error;
    }
    request.nlmsg_seq = ++_sequence;
    int result =
        libmnl().socketSendto(_socket.get(), &request, request.nlmsg_len) < 0 ? MNL_CB_ERROR : MNL_CB_OK;
    while (result == MNL_CB_OK) {
        const ssize_t size = libmnl().socketRecvfrom(_socket.get(), _buffer.data(), _buffer.size());
        if (size < 0 && errno == EINTR) {
            continue; // a signal; a list that has changed meanwhile is told in a message
        }
        result = size < 0 ? MNL_CB_ERROR
                          : libmnl().cbRun(_buffer.data(), static_cast<std::size_t>(size), _sequence, 0,
                                           showMessage, const_cast<Take*>(&take));
    }
    const int error = result == MNL_CB_ERROR ? errno : 0;
    if (error != 0) {
        _socket.reset(); // what is left of the answer must not be met again
    }
    return error;
}

int NetlinkSocket::_open() {
    if (_socket) {
        return 0;
    }
    const Libmnl& mnl = libmnl();
    _socket.reset(mnl.socketOpen2(_protocol, SOCK_CLOEXEC));
    if (!_socket || mnl.socketBind(_socket.get(), 0, MNL_SOCKET_AUTOPID) != 0) {
        const int error = errno;
        _socket.reset();
        return error;
    }
    int on = 1;
    // Has the kernel heed filters; one that cannot lists more, which is looked through where it is asked.
    mnl.socketSetsockopt(_socket.get(), NETLINK_GET_STRICT_CHK, &on, sizeof on);
    ::setsockopt(mnl.socketGetFd(_socket.get()), SOL_SOCKET, SO_RCVTIMEO, &kPatience, sizeof kPatience);
    _buffer.resize(kBufferSize);
    return 0;
}

} // namespace welcomer::posix
