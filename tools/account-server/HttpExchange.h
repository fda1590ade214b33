// What a listener knows of a connection and of the request on it. Only HttpListener includes this.

#pragma once

#include "propertylist/Characters.h"
#include "tools/account-server/HttpListener.h"

#include <array>
#include <charconv>
#include <ctime>
#include <gnutls/gnutls.h>
#include <memory>
#include <microhttpd.h>
#include <optional>
#include <string>
#include <string_view>
#include <sys/socket.h>
#include <utility>

namespace welcomer::server {

struct HttpListener::Exchange {
    Exchange(Connection& on, MHD_Connection* itsHandle, Timers& timers)
        : connection(on),
          handle(itsHandle),
          delay(timers) {}

    Connection& connection;
    MHD_Connection* const handle;
    Request request;
    std::size_t received = 0; // bytes of the body
    std::size_t stored = 0;   // those of them that were kept for the answer
    std::optional<Answer> answer;
    Timers::Timer delay; // the answer is held back until then
};

struct HttpListener::Connection {
    Connection(int itsSocket, gnutls_session_t itsSession, PeerOf::Connected peer, Timers& timers)
        : socket(itsSocket),
          session(itsSession),
          from(std::move(peer)),
          limit(timers) {}

    // The library meets the end, and lets go of the connection when it is run.
    void end() const { ::shutdown(socket, SHUT_RDWR); }

    // Sends something past the library, as far as the connection takes it at once.
    void send(std::string_view text) const {
        if (session) {
            gnutls_record_send(session, text.data(), text.size());
        } else {
            ::send(socket, text.data(), text.size(), MSG_DONTWAIT | MSG_NOSIGNAL);
        }
    }

    const int socket;               // the library's
    const gnutls_session_t session; // too; null in the clear
    const PeerOf::Connected from;
    Timers::Timer limit; // until then it has to go on
    std::unique_ptr<Exchange> exchange;
};

// An answer as it goes over the connection, which ends with it.
inline std::string asText(const Answer& answer) {
    std::array<char, 64> date{};
    const std::time_t now = std::time(nullptr);
    std::tm parts{};
    std::strftime(date.data(), date.size(), "%a, %d %b %Y %H:%M:%S GMT", ::gmtime_r(&now, &parts));
    const char* const reason = MHD_get_reason_phrase_for(answer.status);
    return "HTTP/1.1 " + std::to_string(answer.status) + " " + reason + "\r\nDate: " + date.data() +
           "\r\nConnection: close\r\nContent-Type: " + answer.contentType +
           "\r\nContent-Length: " + std::to_string(answer.body.size()) + "\r\n\r\n" + answer.body;
}

// The length of a body as its head has it; as long as can be where that is no number, 0 where there is none.
inline std::size_t announcedLength(std::string_view field) {
    std::size_t length = 0;
    const auto [end, error] = std::from_chars(field.data(), field.data() + field.size(), length);
    const bool isNumber = error == std::errc() && end == field.data() + field.size();
    return field.empty() || isNumber ? length : std::string_view::npos;
}

// The last of the fields that say for whom a request was forwarded.
inline std::string lastForwardedFor(MHD_Connection* handle) {
    std::string last;
    MHD_get_connection_values(
        handle, MHD_HEADER_KIND,
        [](void* found, MHD_ValueKind /*kind*/, const char* name, const char* value) {
            constexpr std::string_view wanted = "x-forwarded-for";
            if (value && equalsIgnoringCase(name, wanted)) {
                *static_cast<std::string*>(found) = value;
            }
            return MHD_YES;
        },
        &last);
    return last;
}

} // namespace welcomer::server
