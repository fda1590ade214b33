#include "backends/posix/SystemLogConnection.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <poll.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/uio.h>
#include <sys/un.h>

namespace welcomer::posix {

namespace {

constexpr char kLogPath[] = "/dev/log";
constexpr std::size_t kLongestHead = 128; // a program's short name has hardly ever more than 15 bytes

std::chrono::microseconds timeUntil(std::chrono::steady_clock::time_point deadline) {
    const auto left = deadline - std::chrono::steady_clock::now();
    return std::max(std::chrono::ceil<std::chrono::microseconds>(left), std::chrono::microseconds::zero());
}

// Waits until the daemon may have room for more. False when the time is up.
bool waitForRoom(int socket, std::chrono::steady_clock::time_point deadline) {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(timeUntil(deadline));
    pollfd room{socket, POLLOUT, 0};
    return left.count() > 0 && (::poll(&room, 1, static_cast<int>(left.count())) != 0);
}

// What stands before the message: "<115>Nov 20 22:06:34 program: ".
std::string_view writeHead(std::array<char, kLongestHead>& bytes, int priority) {
    static constexpr std::array kMonths{"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                        "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
    const std::time_t now = std::time(nullptr);
    std::tm local{};
    ::localtime_r(&now, &local);
    const int size = std::snprintf(bytes.data(), bytes.size(), "<%d>%s %2d %02d:%02d:%02d %.64s: ", priority,
                                   kMonths.at(static_cast<std::size_t>(local.tm_mon)), local.tm_mday,
                                   local.tm_hour, local.tm_min, local.tm_sec, program_invocation_short_name);
    return {bytes.data(), static_cast<std::size_t>(std::max(size, 0))};
}

// Steps over what was sent.
void skip(std::array<iovec, 3>& parts, std::size_t count) {
    for (iovec& part : parts) {
        const std::size_t taken = std::min(count, part.iov_len);
        part.iov_base = static_cast<char*>(part.iov_base) + taken;
        part.iov_len -= taken;
        count -= taken;
    }
}

bool isEmpty(const std::array<iovec, 3>& parts) {
    return std::ranges::all_of(parts, [](const iovec& part) { return part.iov_len == 0; });
}

iovec partOf(std::string_view text) {
    return {const_cast<char*>(text.data()), text.size()}; // only read from
}

} // namespace

void SystemLogConnection::send(int priority, std::string_view message) {
    const int errorBefore = errno;
    const Deadline deadline = std::chrono::steady_clock::now() + kLongestLogCall;
    std::array<char, kLongestHead> bytes;
    const std::string_view head = writeHead(bytes, priority);
    if (_beginRecord(deadline)) {
        // The daemon may have been started anew since the last record.
        for (int attempt = 0; attempt < 2; ++attempt) {
            if (!_socket && !_open(deadline)) {
                break;
            }
            if (_send(head, message, deadline) != Sent::NoConnection) {
                break;
            }
        }
        _endRecord();
    }
    errno = errorBefore;
}

// Who waits behind another record has no more time for that.
bool SystemLogConnection::_beginRecord(Deadline deadline) {
    std::unique_lock lock(_mutex);
    if (!_isFree.wait_until(lock, deadline, [this] { return !_isBusy; })) {
        return false;
    }
    _isBusy = true;
    return true;
}

void SystemLogConnection::_endRecord() {
    {
        const std::lock_guard lock(_mutex);
        _isBusy = false;
    }
    _isFree.notify_one();
}

bool SystemLogConnection::_open(Deadline deadline) {
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    std::memcpy(static_cast<char*>(address.sun_path), kLogPath, sizeof kLogPath);
    for (const int type : {SOCK_DGRAM, SOCK_STREAM}) {
        FileDescriptor opened(::socket(AF_UNIX, type | SOCK_CLOEXEC, 0));
        // A stream waits where too many wait to be let in; no time at all would mean to wait for ever.
        const auto left = std::max(timeUntil(deadline), std::chrono::microseconds(1)).count();
        const timeval patience{left / 1'000'000, left % 1'000'000};
        ::setsockopt(opened.get(), SOL_SOCKET, SO_SNDTIMEO, &patience, sizeof patience);
        if (opened &&
            ::connect(opened.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0) {
            _socket = std::move(opened);
            _isStream = type == SOCK_STREAM;
            return true;
        }
        if (errno != EPROTOTYPE) {
            break;
        }
    }
    return false;
}

SystemLogConnection::Sent SystemLogConnection::_send(std::string_view head, std::string_view message,
                                                     Deadline deadline) {
    // On a stream a NUL ends each record.
    std::array<iovec, 3> parts{partOf(head), partOf(message), partOf({"", _isStream ? 1U : 0U})};
    msghdr record{};
    record.msg_iov = parts.data();
    record.msg_iovlen = parts.size();
    bool isTorn = false;
    while (!isEmpty(parts)) {
        const ssize_t count = ::sendmsg(_socket.get(), &record, MSG_NOSIGNAL | MSG_DONTWAIT);
        if (count >= 0) {
            skip(parts, static_cast<std::size_t>(count));
            isTorn = true;
        } else if (errno == EAGAIN ? !waitForRoom(_socket.get(), deadline) : errno != EINTR) {
            return _failed(isTorn);
        }
    }
    return Sent::Whole;
}

SystemLogConnection::Sent SystemLogConnection::_failed(bool isTorn) {
    const bool isTooLate = errno == EAGAIN;
    const bool isTooLong = errno == EMSGSIZE;
    if (isTooLong || (isTooLate && !isTorn)) {
        return Sent::Lost;
    }
    _close(); // what comes next is to be no part of a torn record
    return isTooLate ? Sent::Lost : Sent::NoConnection;
}

void SystemLogConnection::_close() {
    // A number that a plug-in has closed may be somebody else's by now.
    const int error = errno;
    if (error == EBADF || error == ENOTSOCK) {
        static_cast<void>(_socket.release());
    }
    _socket = FileDescriptor();
}

} // namespace welcomer::posix
