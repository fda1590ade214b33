#include "tools/account-server/HttpListener.h"

#include "tools/account-server/HttpExchange.h"

#include <algorithm>
#include <fcntl.h>
#include <limits>
#include <microhttpd.h>
#include <stdexcept>
#include <sys/socket.h>
#include <utility>

namespace welcomer::server {

namespace {

constexpr std::size_t kConnectionMemory = std::size_t{16} * 1024;  // bytes: what a head may be long
constexpr std::size_t kAllBodies = std::size_t{256} * 1024 * 1024; // bytes, of one listener
constexpr std::size_t kReservedForBody = std::size_t{64} * 1024;   // bytes, before any of it has come
constexpr char kTlsVersions[] = "NORMAL:-VERS-ALL:+VERS-TLS1.3:+VERS-TLS1.2";

// Of the connections on a Unix socket one user has no more than this part of all, so that others can sign in, too.
constexpr std::size_t kShareOfAUser = 16;
constexpr std::size_t kLeastOfAUser = 8;

bool isUnixSocket(int socket) {
    int domain = 0;
    socklen_t length = sizeof domain;
    return ::getsockopt(socket, SOL_SOCKET, SO_DOMAIN, &domain, &length) == 0 && domain == AF_UNIX;
}

MHD_Result result(bool isSuccess) {
    return isSuccess ? MHD_YES : MHD_NO;
}

} // namespace

// What the library calls, all of it while it is run.
struct HttpListener::Callbacks {
    static void log(void* self, const char* format, va_list arguments) {
        auto& listener = *static_cast<HttpListener*>(self);
        if (!listener._daemon) { // afterwards it tells of every client that does not behave
            std::array<char, 256> line{};
            std::vsnprintf(line.data(), line.size(), format, arguments);
            listener._startMessage = line.data();
        }
    }

    static void connection(void* self, MHD_Connection* handle, void** place,
                           MHD_ConnectionNotificationCode code) {
        auto& listener = *static_cast<HttpListener*>(self);
        if (code == MHD_CONNECTION_NOTIFY_STARTED) {
            *place = listener._connected(handle);
        } else {
            listener._disconnected(static_cast<Connection*>(*place));
        }
    }

    static MHD_Result access(void* self, MHD_Connection* handle, const char* url, const char* method,
                             const char* /*version*/, const char* bytes, std::size_t* count, void** place) {
        auto& listener = *static_cast<HttpListener*>(self);
        if (!*place) {
            return result(listener._begin(handle, url, method, place));
        }
        auto& exchange = *static_cast<Exchange*>(*place);
        if (*count > 0) {
            const std::size_t length = std::exchange(*count, 0);
            // The library's own memory, which it does not look at again.
            return result(listener._appendBody(exchange, const_cast<char*>(bytes), length));
        }
        return result(exchange.answer ? listener._send(exchange) : listener._startWork(exchange));
    }

    static void completed(void* self, MHD_Connection* /*handle*/, void** place,
                          MHD_RequestTerminationCode /*code*/) {
        if (const auto* const exchange = static_cast<Exchange*>(*place)) {
            static_cast<HttpListener*>(self)->_completed(*exchange);
            *place = nullptr;
        }
    }
};

HttpListener::HttpListener(posix::FileDescriptor socket, const TlsIdentity* identity,
                           const Settings& settings, RequestHandler& handler,
                           const HttpSurroundings& surroundings)
    : _socket(std::move(socket)),
      _isForUsers(isUnixSocket(_socket.get())),
      _identity(identity ? std::make_unique<TlsIdentity>(*identity) : nullptr),
      _settings(settings),
      _handler(handler),
      _surroundings(surroundings),
      _peerOf(settings) {
    // Whoever shares the socket may take the connection that woke this one.
    ::fcntl(_socket.get(), F_SETFL, ::fcntl(_socket.get(), F_GETFL) | O_NONBLOCK);
    unsigned flags = MHD_USE_EPOLL | MHD_ALLOW_SUSPEND_RESUME | MHD_USE_ERROR_LOG;
    std::vector<MHD_OptionItem> options = {
        {MHD_OPTION_LISTEN_SOCKET, _socket.get(), nullptr},
        {MHD_OPTION_CONNECTION_LIMIT, static_cast<std::intptr_t>(settings.connections), nullptr},
        {MHD_OPTION_CONNECTION_MEMORY_LIMIT, static_cast<std::intptr_t>(kConnectionMemory), nullptr},
        {MHD_OPTION_STRICT_FOR_CLIENT, 1, nullptr}};
    if (_identity) {
        flags |= MHD_USE_TLS;
        options.push_back({MHD_OPTION_HTTPS_MEM_CERT, 0, _identity->certificate.data()});
        options.push_back({MHD_OPTION_HTTPS_MEM_KEY, 0, _identity->key.data()});
        options.push_back({MHD_OPTION_HTTPS_PRIORITIES, 0, const_cast<char*>(kTlsVersions)});
    }
    options.push_back({MHD_OPTION_END, 0, nullptr});
    MHD_Daemon* const daemon = MHD_start_daemon(
        flags, 0, nullptr, nullptr, &Callbacks::access, this, MHD_OPTION_EXTERNAL_LOGGER, &Callbacks::log,
        this, MHD_OPTION_NOTIFY_CONNECTION, &Callbacks::connection, this, MHD_OPTION_NOTIFY_COMPLETED,
        &Callbacks::completed, this, MHD_OPTION_ARRAY, options.data(), MHD_OPTION_END);
    if (!daemon) {
        while (_startMessage.ends_with('\n')) {
            _startMessage.pop_back();
        }
        throw std::runtime_error(_startMessage.empty() ? "the socket cannot be served" : _startMessage);
    }
    _daemon = daemon;
}

HttpListener::~HttpListener() {
    drain();
    MHD_stop_daemon(_daemon);
}

int HttpListener::descriptor() const {
    return MHD_get_daemon_info(_daemon, MHD_DAEMON_INFO_EPOLL_FD)->epoll_fd;
}

bool HttpListener::isPending() const {
    MHD_UNSIGNED_LONG_LONG milliseconds = 0;
    return MHD_get_timeout(_daemon, &milliseconds) == MHD_YES && milliseconds == 0;
}

void HttpListener::run() {
    _resumeFinished();
    MHD_run(_daemon);
}

void HttpListener::drain() {
    if (std::exchange(_drains, true)) {
        return;
    }
    MHD_quiesce_daemon(_daemon); // the socket is not the library's any more
    for (const auto& connection : _connections) {
        if (!connection->exchange) {
            connection->end();
        }
    }
}

void HttpListener::breakOff() {
    for (const auto& connection : _connections) {
        connection->end();
    }
}

HttpListener::Connection* HttpListener::_connected(MHD_Connection* handle) {
    const int socket = MHD_get_connection_info(handle, MHD_CONNECTION_INFO_CONNECTION_FD)->connect_fd;
    auto* const session = static_cast<gnutls_session_t>(
        _identity ? MHD_get_connection_info(handle, MHD_CONNECTION_INFO_GNUTLS_SESSION)->tls_session
                  : nullptr);
    auto connection =
        std::make_unique<Connection>(socket, session, _peerOf.connected(socket), _surroundings.timers);
    ++_surroundings.metrics.connections;
    if (connection->from.isAllowed && !_hasEnough(connection->from)) {
        _limitArrival(*connection, _settings.headLimit);
    } else {
        connection->end();
    }
    _connections.push_back(std::move(connection));
    return _connections.back().get();
}

bool HttpListener::_hasEnough(const PeerOf::Connected& from) const {
    if (!_isForUsers || from.isFront) {
        return false;
    }
    const auto count = std::ranges::count_if(
        _connections, [&](const auto& each) { return each->from.peer.counted == from.peer.counted; });
    return static_cast<std::size_t>(count) >= std::max(_settings.connections / kShareOfAUser, kLeastOfAUser);
}

void HttpListener::_disconnected(const Connection* connection) {
    --_surroundings.metrics.connections;
    _connections.remove_if([&](const auto& each) { return each.get() == connection; });
}

bool HttpListener::_begin(MHD_Connection* handle, const char* url, const char* method, void** place) {
    auto* const connection = static_cast<Connection*>(
        MHD_get_connection_info(handle, MHD_CONNECTION_INFO_SOCKET_CONTEXT)->socket_context);
    const auto field = [&](const char* name) {
        const char* const value = MHD_lookup_connection_value(handle, MHD_HEADER_KIND, name);
        return std::string(value ? value : "");
    };
    auto exchange = std::make_unique<Exchange>(*connection, handle, _surroundings.timers);
    exchange->request = {method,
                         url,
                         field("Content-Type"),
                         field("Accept"),
                         PeerOf::sender(connection->from, lastForwardedFor(handle)),
                         {}};
    const std::size_t length = announcedLength(field("Content-Length"));
    exchange->answer = _handler.answerAtOnce(exchange->request, length);
    exchange->request.body.reserve(std::min(length, kReservedForBody));
    connection->exchange = std::move(exchange);
    *place = connection->exchange.get();
    _limitArrival(*connection, _settings.bodyLimit);
    // Nobody waits for a body that is too long.
    return length <= kLongestBody || _send(*connection->exchange);
}

bool HttpListener::_appendBody(Exchange& exchange, char* bytes, std::size_t count) {
    exchange.received += count;
    if (exchange.received > kLongestBody || _bodyBytes + count > kAllBodies) {
        ++_surroundings.metrics.brokenOff;
        return false;
    }
    if (!exchange.answer) {
        _bodyBytes += count;
        exchange.stored += count;
        exchange.request.body.insert(exchange.request.body.end(), bytes, bytes + count);
    }
    ::explicit_bzero(bytes, count);
    return true;
}

bool HttpListener::_startWork(Exchange& exchange) {
    const bool isTaken = _surroundings.workers.take([this, &exchange] {
        exchange.answer = _handler.answer(exchange.request);
        WipedBytes().swap(exchange.request.body);
        const std::lock_guard lock(_mutex);
        _finished.push_back(&exchange);
        _surroundings.wake();
    });
    if (!isTaken) {
        exchange.answer = _handler.overloaded(exchange.request);
        return _send(exchange);
    }
    exchange.connection.limit.cancel();
    ++_surroundings.metrics.underWay;
    MHD_suspend_connection(exchange.handle);
    return true;
}

void HttpListener::_resumeFinished() {
    std::vector<Exchange*> finished;
    {
        const std::lock_guard lock(_mutex);
        finished.swap(_finished);
    }
    for (Exchange* const exchange : finished) {
        const auto resume = [this, exchange] {
            --_surroundings.metrics.underWay;
            MHD_resume_connection(exchange->handle);
        };
        if (exchange->answer->delay.count() > 0) {
            exchange->delay.set(std::chrono::duration_cast<Timers::Clock::duration>(exchange->answer->delay),
                                resume);
        } else {
            resume();
        }
    }
}

bool HttpListener::_send(Exchange& exchange) {
    const Answer& answer = *exchange.answer;
    MHD_Response* const response = MHD_create_response_from_buffer(
        answer.body.size(), const_cast<char*>(answer.body.data()), MHD_RESPMEM_MUST_COPY);
    if (!response) {
        return false;
    }
    if (!answer.contentType.empty()) {
        MHD_add_response_header(response, "Content-Type", answer.contentType.c_str());
    }
    for (const auto& [name, value] : answer.fields) {
        MHD_add_response_header(response, name.c_str(), value.c_str());
    }
    if (_drains) {
        MHD_add_response_header(response, "Connection", "close");
    }
    const bool isQueued = MHD_queue_response(exchange.handle, answer.status, response) == MHD_YES;
    MHD_destroy_response(response);
    exchange.connection.limit.set(_settings.answerLimit, [this, &connection = exchange.connection] {
        ++_surroundings.metrics.brokenOff;
        connection.end();
    });
    return isQueued;
}

void HttpListener::_completed(const Exchange& exchange) {
    Connection& connection = exchange.connection;
    _bodyBytes -= exchange.stored;
    connection.exchange.reset();
    if (_drains) {
        connection.end();
    } else {
        // Nothing is wrong with a client that has no more to ask.
        connection.limit.set(_settings.idleLimit, [&connection] { connection.end(); });
    }
}

void HttpListener::_limitArrival(Connection& connection, std::chrono::seconds limit) {
    connection.limit.set(limit, [this, &connection] {
        ++_surroundings.metrics.brokenOff;
        // The library takes no answer while a request arrives.
        connection.send(asText(_handler.tooSlow(connection.from.peer)));
        connection.end();
    });
}

} // namespace welcomer::server
