#include "tests/support/SystemLogSocket.h"

#include "tests/support/MountNamespace.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <sys/un.h>
#include <system_error>
#include <unistd.h>

namespace welcomer {

namespace {

constexpr std::size_t kMaximumRecord = 1 << 20;
constexpr char kLogPath[] = "/dev/log";

// The length of "Nov 20 22:06:34 ".
constexpr std::size_t kDateLength = 16;

SystemLogSocket::Record parse(const std::string& text) {
    const std::size_t bracket = text.find('>');
    const std::size_t name = bracket + 1 + kDateLength;
    const std::size_t colon = text.find(": ", name);
    return {std::atoi(text.c_str() + 1), text.substr(name, colon - name), text.substr(colon + 2)};
}

} // namespace

bool SystemLogSocket::isPossible() {
    return mayMount();
}

SystemLogSocket::SystemLogSocket() {
    enterMountNamespace();
    mountMemory("/dev", "64k");
    ::mknod("/dev/null", S_IFCHR | 0666, ::makedev(1, 3));
    ::mknod("/dev/urandom", S_IFCHR | 0666, ::makedev(1, 9));

    _socket = ::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    std::memcpy(static_cast<char*>(address.sun_path), kLogPath, sizeof kLogPath);
    if (::bind(_socket, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
        throw std::system_error(errno, std::generic_category(), kLogPath);
    }
}

SystemLogSocket::~SystemLogSocket() {
    ::close(_socket);
}

std::vector<SystemLogSocket::Record> SystemLogSocket::take() const {
    std::vector<Record> records;
    std::string buffer(kMaximumRecord, '\0');
    while (true) {
        const ssize_t size = ::recv(_socket, buffer.data(), buffer.size(), MSG_DONTWAIT);
        if (size < 0) {
            return records;
        }
        records.push_back(parse(buffer.substr(0, static_cast<std::size_t>(size))));
    }
}

} // namespace welcomer
