// The kinds of failures that the account server tells of, as problem details (RFC 9457).

#pragma once

#include <array>
#include <cstdint>
#include <string_view>

namespace welcomer::accountserver {

enum class ProblemType {
    InvalidRequest,
    WrongPassword,
    UnknownUser,
    WrongCredentials,
    TermsOfService,
    Repair,
    NoSuchResource,
    MethodNotAllowed,
    NotAcceptable,
    RequestTimeout,
    OtherTerms,
    ContentTooLarge,
    UnsupportedMediaType,
    TooManyTries,
    ServerError,
    NotSupported,
    Unavailable
};

// What there is to know of each.
struct ProblemKind {
    ProblemType type;
    const char* uri;           // of the member "type"
    int httpStatus;            // that it comes with
    std::int64_t accountError; // platform::kSKAccountError..., what it is for the account service
    const char* title;         // for people
};

// By ProblemType. docs/account-server.md has the same table.
extern const std::array<ProblemKind, 17> kProblemKinds;

// The kind of a problem. Any thread.
const ProblemKind& kindOf(ProblemType type);

// The kind with a URI, compared letter by letter; or null. Any thread.
const ProblemKind* kindWithURI(std::string_view uri);

} // namespace welcomer::accountserver
