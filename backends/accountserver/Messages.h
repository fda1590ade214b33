// The messages between a machine and the account server, as values, and as the bytes of a body. Both ends use
// this.

#pragma once

#include "backends/accountserver/ProblemType.h"
#include "backends/accountserver/Protocol.h"
#include "propertylist/PropertyList.h"

#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <string_view>

namespace welcomer::accountserver {

// The machine that asks.
struct Machine {
    std::string product; // the system's name, such as "Debian GNU/Linux"
    std::string version; // the system's, such as "12"
    std::string locale;  // of the user who asks, such as "de_AT.UTF-8"
    friend bool operator==(const Machine&, const Machine&) = default;
};

// Who asks, in every request that has a password. The password itself stands beside it, so that it can be
// held in one place.
struct Sender {
    std::string requestID; // the same in a request that is sent once more
    std::string user;      // not empty
    Machine machine;
    friend bool operator==(const Sender&, const Sender&) = default;
};

// POST /v1/authenticate.
struct AuthenticateRequest {
    Sender sender;
    PropertyList::Dictionary delegatesRequest; // as the account service was given it
    friend bool operator==(const AuthenticateRequest&, const AuthenticateRequest&) = default;
};

// POST /v1/accept-terms.
struct AcceptTermsRequest {
    Sender sender;
    PropertyList terms; // the error info that asked for it, as it came
    friend bool operator==(const AcceptTermsRequest&, const AcceptTermsRequest&) = default;
};

// A service that an account has.
struct AccountServiceEntry {
    bool canBeEnabled = true;
    PropertyList::Dictionary properties = {};
    friend bool operator==(const AccountServiceEntry&, const AccountServiceEntry&) = default;
};

// What a request to authenticate is answered, with the HTTP status 200.
struct AuthenticateAnswer {
    std::int64_t status = 0;                                                 // 0 for success
    std::string accountID;                                                   // the user name of the request
    std::optional<PropertyList::Dictionary> delegates = {};                  // each one's response
    std::optional<std::string> mailAddress = {};                             // of the mail service
    std::optional<std::map<std::string, AccountServiceEntry>> services = {}; // none: all that there are
    friend bool operator==(const AuthenticateAnswer&, const AuthenticateAnswer&) = default;
};

// Any failure; its kind says the HTTP status.
struct Problem {
    ProblemType type = ProblemType::ServerError;
    std::string detail = {};                    // for people, one line; empty: the title says it all
    std::string requestID = {};                 // of the request, where that had one
    std::optional<PropertyList> errorInfo = {}; // with the terms of service, and with repair
    friend bool operator==(const Problem&, const Problem&) = default;
};

// GET /v1/server, for who looks whether there is one.
struct ServerDescription {
    std::string server;  // the program's name
    std::string version; // the program's
    friend bool operator==(const ServerDescription&, const ServerDescription&) = default;
};

// Each writes the body of a message.
//  error   where to say what that form of content cannot hold and where it is, or null. Only JSON and
//          requests' passwords can be the reason as long as findUnwritableValue() has nothing to say
//  result  the bytes; none where there is such a thing, or the body would be longer than kMaximumBodySize
// Any thread.
std::optional<std::string> encode(const AuthenticateRequest& request, std::string_view password,
                                  ContentType type, std::string* error = nullptr);
std::optional<std::string> encode(const AcceptTermsRequest& request, std::string_view password,
                                  ContentType type, std::string* error = nullptr);
std::optional<std::string> encode(const AuthenticateAnswer& answer, ContentType type,
                                  std::string* error = nullptr);
std::optional<std::string> encode(const Problem& problem, ContentType type, std::string* error = nullptr);
std::optional<std::string> encode(const ServerDescription& description, ContentType type,
                                  std::string* error = nullptr);

// What was read, or why it could not be.
template <class Message>
struct Decoded {
    std::optional<Message> message = {};
    std::string error = {}; // one line of printable ASCII; empty on success
    explicit operator bool() const { return message.has_value(); }
};

// A request with the password that came with it.
template <class Request>
struct WithPassword {
    Request request;
    std::string password;
};

// Each reads the body of a message: whatever the bytes are, it answers with the message or with what is
// wrong. A member that is missing, or is something else than it should be, is named; members that are not
// known are passed over. Never throws for bad input. Any thread.
Decoded<WithPassword<AuthenticateRequest>> decodeAuthenticateRequest(std::string_view body, ContentType type);
Decoded<WithPassword<AcceptTermsRequest>> decodeAcceptTermsRequest(std::string_view body, ContentType type);
Decoded<AuthenticateAnswer> decodeAuthenticateAnswer(std::string_view body, ContentType type);
// A problem whose type is not known, or comes with another HTTP status than its own, cannot be read.
Decoded<Problem> decodeProblem(std::string_view body, ContentType type, int httpStatus);
Decoded<ServerDescription> decodeServerDescription(std::string_view body, ContentType type);

// The body of a request without its password, in two parts: between them stands the password as
// escapePassword() writes it. So a body can be put together in a place of its own, and no other holds the
// password.
struct AroundPassword {
    std::string before;
    std::string after;
};
std::optional<AroundPassword> encodeAroundPassword(const AuthenticateRequest& request, ContentType type,
                                                   std::string* error = nullptr);
std::optional<AroundPassword> encodeAroundPassword(const AcceptTermsRequest& request, ContentType type,
                                                   std::string* error = nullptr);

// Why a password cannot be sent in that form; null where it can. Any thread.
const char* whyNotSendable(std::string_view password, ContentType type);

// Writes a sendable password, piece by piece. Any thread.
//  append  called with each piece in turn; they are parts of the password, and constants
void escapePassword(std::string_view password, ContentType type,
                    const std::function<void(std::string_view piece)>& append);

} // namespace welcomer::accountserver
