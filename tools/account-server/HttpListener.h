// One listening socket and the connections that have come in on it, over libmicrohttpd, which does not bound how
// long a request takes to arrive or how long a body without a length is: that is done here.

#pragma once

#include "backends/accountserver/Protocol.h"
#include "backends/posix/FileDescriptor.h"
#include "tools/account-server/Http.h"
#include "tools/account-server/Metrics.h"
#include "tools/account-server/PeerOf.h"
#include "tools/account-server/Settings.h"
#include "tools/account-server/Timers.h"
#include "tools/account-server/WorkerPool.h"

#include <cstddef>
#include <functional>
#include <list>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

struct MHD_Connection;
struct MHD_Daemon;

namespace welcomer::server {

// Longer bodies are broken off.
inline constexpr std::size_t kLongestBody = accountserver::kMaximumBodySize;

// The certificate that a socket shows, both in PEM.
struct TlsIdentity {
    std::string certificate;
    std::string key;
};

// What the listeners of a server share. Borrows everything.
struct HttpSurroundings {
    Timers& timers;
    Metrics& metrics;
    WorkerPool& workers;
    std::function<void()> wake; // has the thread of the events call run(); any thread
};

// On the thread of the events, but where something else is said.
class HttpListener {
  public:
    // Throws std::runtime_error with one line when the socket cannot be served.
    //  socket    listens; it is another name of the one that others may have, too
    //  identity  none for a connection in the clear
    //  handler   borrowed
    HttpListener(posix::FileDescriptor socket, const TlsIdentity* identity, const Settings& settings,
                 RequestHandler& handler, const HttpSurroundings& surroundings);

    // No request is under way any more.
    ~HttpListener();
    HttpListener(const HttpListener&) = delete;
    HttpListener& operator=(const HttpListener&) = delete;

    // Readable when run() is to be called.
    int descriptor() const;

    // Whether run() has something to do although the descriptor is not readable.
    bool isPending() const;

    // Does what there is to do without waiting.
    void run();

    // Takes no new connection, and lets each go once it has its answer.
    void drain();

    // Ends the connections, but for those whose request is being worked on.
    void breakOff();

    bool isEmpty() const { return _connections.empty(); }

  private:
    struct Connection;
    struct Exchange;
    struct Callbacks;
    using Connections = std::list<std::unique_ptr<Connection>>;

    // The stations of a connection and of a request; where one says false the connection ends.
    Connection* _connected(MHD_Connection* handle);
    bool _begin(MHD_Connection* handle, const char* url, const char* method, void** place);
    bool _appendBody(Exchange& exchange, char* bytes, std::size_t count);
    bool _startWork(Exchange& exchange);
    void _resumeFinished();
    bool _send(Exchange& exchange);
    void _completed(const Exchange& exchange);
    void _disconnected(const Connection* connection);

    // Whether somebody who connects holds as many connections as one user may.
    bool _hasEnough(const PeerOf::Connected& from) const;

    // Has a request arrive in time: tells the client else, and ends the connection.
    void _limitArrival(Connection& connection, std::chrono::seconds limit);

    const posix::FileDescriptor _socket;
    const bool _isForUsers; // of this machine, by a Unix socket
    const std::unique_ptr<TlsIdentity> _identity;
    const Settings& _settings;
    RequestHandler& _handler;
    const HttpSurroundings _surroundings;
    const PeerOf _peerOf;
    Connections _connections;
    bool _drains = false;
    std::size_t _bodyBytes = 0; // that are in memory
    std::string _startMessage;  // what the library says while it starts
    MHD_Daemon* _daemon = nullptr;

    std::mutex _mutex;
    std::vector<Exchange*> _finished; // by worker threads
};

} // namespace welcomer::server
