// A server on a Unix socket that answers each request with the bytes that a test wants.

#pragma once

#include "backends/posix/FileDescriptor.h"

#include <atomic>
#include <functional>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

namespace welcomer {

// One request as it came.
struct StubRequest {
    std::string line;   // "POST /v1/authenticate HTTP/1.1"
    std::string fields; // the header, with the line ends
    std::string body;
};

// An answer in HTTP, whole.
std::string httpAnswer(int status, const std::string& contentType, const std::string& body,
                       const std::string& moreFields = "");

// Serves one connection after the other, each for one request, from when it is made until it ends.
class StubServer {
  public:
    // What is sent before the connection is closed. Called on the server's thread.
    using Answer = std::function<std::string(const StubRequest& request)>;

    StubServer(std::string path, Answer answer);
    ~StubServer();
    StubServer(const StubServer&) = delete;
    StubServer& operator=(const StubServer&) = delete;

    // All that have come so far.
    std::vector<StubRequest> requests();

  private:
    void _serve();
    void _serveOne(int connection);

    const std::string _path;
    const Answer _answer;
    posix::FileDescriptor _socket;
    std::atomic<bool> _isEnding{false};
    std::mutex _mutex;
    std::vector<StubRequest> _requests;
    std::thread _thread;
};

} // namespace welcomer
