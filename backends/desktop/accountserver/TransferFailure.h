// What a transfer that came to nothing says to people, so that they know what to do.

#pragma once

#include "backends/desktop/accountserver/AccountServerModule.h"

#include <curl/curl.h>
#include <string>

namespace welcomer::desktop {

struct TransferFailure {
    CURLcode code = CURLE_OK; // this for an answer that does not say how long it is
    std::string explanation;  // libcurl's own, perhaps empty
    long systemError = 0;     // of connecting, or 0
    long verifyResult = 0;    // of the certificate, as the TLS library counts; 0 for none
    long proxyStatus = 0;     // what a proxy has answered, an HTTP status; 0 for none
    bool wasConnected = false;
    bool isTooLong = false; // the answer
};

// Whether the server is a Unix socket's.
bool isSocket(const AccountServerSettings& settings);

// The server's name for people: "accounts.example:8443", "the socket /run/a".
std::string shownServer(const AccountServerSettings& settings);

// One line. Any thread.
std::string explain(const TransferFailure& failure, const AccountServerSettings& settings);

// Whether the same request may come to something else soon, if it has not been sent. Any thread.
bool mayPass(const TransferFailure& failure);

} // namespace welcomer::desktop
