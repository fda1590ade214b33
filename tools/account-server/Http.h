// Requests and answers as the server sees them, whatever carries them.

#pragma once

#include "tools/account-server/WipedMemory.h"

#include <chrono>
#include <cstddef>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace welcomer::server {

// Who sends a request.
struct Peer {
    std::string shown;   // for log lines: an address, or a user of this machine
    std::string counted; // whose failures count together: that, and for IPv6 the network
};

struct Request {
    std::string method;
    std::string path;
    std::string contentType; // empty where the request has none
    std::string accepted;    // what the client takes for an answer; empty where it does not say
    Peer peer;
    WipedBytes body;
};

struct Answer {
    unsigned status = 200;
    std::string contentType;
    std::string body;
    std::vector<std::pair<std::string, std::string>> fields; // further ones of its head
    std::chrono::duration<double> delay{0};                  // how long it is held back
};

// What answers requests.
class RequestHandler {
  public:
    virtual ~RequestHandler() = default;

    // An answer that needs no look at the body; none where it takes one.
    //  announcedLength  of the body, where the request has announced it
    // On the thread of the events: does not block.
    virtual std::optional<Answer> answerAtOnce(const Request& request, std::size_t announcedLength) = 0;

    // On a thread that may block, several at once. Throws nothing.
    virtual Answer answer(Request& request) = 0;

    // What a request is answered that nobody has the time for. On the thread of the events.
    virtual Answer overloaded(const Request& request) = 0;

    // What a client is told that takes too long to send its request. On the thread of the events.
    //  peer  the client
    virtual Answer tooSlow(const Peer& peer) = 0;
};

} // namespace welcomer::server
