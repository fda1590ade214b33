#include "tests/support/StubServer.h"

#include "tests/support/ListeningSocket.h"

#include <cstring>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

namespace welcomer {

namespace {

constexpr int kSlice = 20; // milliseconds, until the end is noticed

// Adds what arrives; false at the end, or when there is none in time.
bool receive(int connection, std::string& bytes) {
    char buffer[65536];
    const ssize_t count = ::recv(connection, buffer, sizeof(buffer), 0);
    if (count <= 0) {
        return false;
    }
    bytes.append(buffer, static_cast<std::size_t>(count));
    ::explicit_bzero(buffer, sizeof(buffer)); // the stub keeps no copies but those that a test can wipe
    return true;
}

std::size_t lengthIn(const std::string& fields) {
    const std::string name = "Content-Length: ";
    const std::size_t at = fields.find(name);
    return at == std::string::npos ? 0 : std::stoul(fields.substr(at + name.size()));
}

} // namespace

std::string httpAnswer(int status, const std::string& contentType, const std::string& body,
                       const std::string& moreFields) {
    return "HTTP/1.1 " + std::to_string(status) + " Whatever\r\n" +
           (contentType.empty() ? "" : "Content-Type: " + contentType + "\r\n") + moreFields +
           "Content-Length: " + std::to_string(body.size()) + "\r\n\r\n" + body;
}

StubServer::StubServer(std::string path, Answer answer)
    : _path(std::move(path)),
      _answer(std::move(answer)),
      _socket(listenOn(_path)) {
    _thread = std::thread([this] { _serve(); });
}

StubServer::~StubServer() {
    _isEnding = true;
    _thread.join();
    ::unlink(_path.c_str());
}

std::vector<StubRequest> StubServer::requests() {
    const std::lock_guard lock(_mutex);
    return _requests;
}

void StubServer::_serve() {
    while (!_isEnding) {
        pollfd waiting = {_socket.get(), POLLIN, 0};
        if (::poll(&waiting, 1, kSlice) == 1) {
            const posix::FileDescriptor connection(::accept4(_socket.get(), nullptr, nullptr, SOCK_CLOEXEC));
            _serveOne(connection.get());
        }
    }
}

void StubServer::_serveOne(int connection) {
    std::string bytes;
    std::size_t end = std::string::npos;
    while ((end = bytes.find("\r\n\r\n")) == std::string::npos) {
        if (!receive(connection, bytes)) {
            return;
        }
    }
    const std::size_t lineEnd = bytes.find("\r\n") + 2;
    StubRequest request{bytes.substr(0, lineEnd - 2), bytes.substr(lineEnd, end + 2 - lineEnd), {}};
    const std::size_t size = end + 4 + lengthIn(request.fields);
    while (bytes.size() < size) {
        if (!receive(connection, bytes)) {
            return;
        }
    }
    request.body = bytes.substr(end + 4);
    ::explicit_bzero(bytes.data(), bytes.size());
    const std::string answer = _answer(request);
    {
        const std::lock_guard lock(_mutex);
        _requests.push_back(std::move(request));
    }
    std::size_t sent = 0;
    while (sent < answer.size()) {
        const ssize_t count = ::send(connection, answer.data() + sent, answer.size() - sent, MSG_NOSIGNAL);
        if (count <= 0) {
            return;
        }
        sent += static_cast<std::size_t>(count);
    }
}

} // namespace welcomer
