// One request to the account server and its answer, over libcurl.

#pragma once

#include "backends/desktop/accountserver/AccountServerModule.h"
#include "backends/desktop/accountserver/Interruption.h"
#include "backends/desktop/accountserver/RequestBody.h"

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>

namespace welcomer::desktop {

// What came back, whatever it means.
struct Reply {
    long status = 0;
    std::string contentType;
    std::string location;                         // where a redirect points to
    std::string body;                             // at most accountserver::kMaximumBodySize
    std::optional<std::int64_t> retryAfter;       // seconds
    std::optional<std::int64_t> date;             // of the server's clock, seconds since 1970
    std::optional<std::int64_t> certificateUntil; // seconds since 1970; none without TLS
};

struct TransferOutcome {
    std::optional<Reply> reply;
    std::string whyNot;        // for people, where there is none
    bool wasNeverSent = false; // the connection has not carried the request
    bool mayHelpAgain = false; // the same may come to something else soon
};

// Sends a request once, on a connection of its own, and waits for the answer. Follows no redirect.
//  proxy  as libcurl takes it; empty: what the environment says. A Unix socket has none
//  path   of the resource
//  body   of a POST; null for a GET
//  limit  how long it may take
// Any thread; blocks.
TransferOutcome transfer(const AccountServerSettings& settings, const std::string& proxy, const char* path,
                         RequestBody* body, std::chrono::milliseconds limit, Interruption& interruption);

} // namespace welcomer::desktop
