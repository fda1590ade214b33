#include "backends/accountserver/ProblemType.h"

#include "platform/AccountService.h"

#include <algorithm>
#include <cstddef>

namespace welcomer::accountserver {

namespace {

using enum ProblemType;
using platform::kSKAccountErrorRepair;
using platform::kSKAccountErrorServerUnavailable;
using platform::kSKAccountErrorTermsOfService;
using platform::kSKAccountErrorUnknownUser;
using platform::kSKAccountErrorWrongPassword;

} // namespace

const std::array<ProblemKind, 17> kProblemKinds = {{
    {InvalidRequest, "urn:welcomer:problem:invalid-request", 400, kSKAccountErrorServerUnavailable,
     "The request makes no sense"},
    {WrongPassword, "urn:welcomer:problem:wrong-password", 401, kSKAccountErrorWrongPassword,
     "The password is wrong"},
    {UnknownUser, "urn:welcomer:problem:unknown-user", 401, kSKAccountErrorUnknownUser,
     "There is no such user"},
    {WrongCredentials, "urn:welcomer:problem:wrong-credentials", 401, kSKAccountErrorWrongPassword,
     "The user name or the password is wrong"},
    {TermsOfService, "urn:welcomer:problem:terms-of-service", 403, kSKAccountErrorTermsOfService,
     "The terms of service are to be accepted first"},
    {Repair, "urn:welcomer:problem:repair", 403, kSKAccountErrorRepair,
     "The account is to be repaired first"},
    {NoSuchResource, "urn:welcomer:problem:no-such-resource", 404, kSKAccountErrorServerUnavailable,
     "There is no such resource"},
    {MethodNotAllowed, "urn:welcomer:problem:method-not-allowed", 405, kSKAccountErrorServerUnavailable,
     "The resource has no such method"},
    {NotAcceptable, "urn:welcomer:problem:not-acceptable", 406, kSKAccountErrorServerUnavailable,
     "The answer cannot be written in a form that is accepted"},
    {RequestTimeout, "urn:welcomer:problem:request-timeout", 408, kSKAccountErrorServerUnavailable,
     "The request took too long to arrive"},
    {OtherTerms, "urn:welcomer:problem:other-terms", 409, kSKAccountErrorTermsOfService,
     "Other terms of service are to be accepted"},
    {ContentTooLarge, "urn:welcomer:problem:content-too-large", 413, kSKAccountErrorServerUnavailable,
     "The request is too long"},
    {UnsupportedMediaType, "urn:welcomer:problem:unsupported-media-type", 415,
     kSKAccountErrorServerUnavailable, "The request is written in a form that is not understood"},
    {TooManyTries, "urn:welcomer:problem:too-many-tries", 429, kSKAccountErrorServerUnavailable,
     "There were too many tries"},
    {ServerError, "urn:welcomer:problem:server-error", 500, kSKAccountErrorServerUnavailable,
     "The server has failed"},
    {NotSupported, "urn:welcomer:problem:not-supported", 501, kSKAccountErrorServerUnavailable,
     "The server cannot do this"},
    {Unavailable, "urn:welcomer:problem:unavailable", 503, kSKAccountErrorServerUnavailable,
     "The server's directory of users does not answer"},
}};

const ProblemKind& kindOf(ProblemType type) {
    return kProblemKinds[static_cast<std::size_t>(type)];
}

const ProblemKind* kindWithURI(std::string_view uri) {
    const auto* const found = std::ranges::find(
        kProblemKinds, uri, [](const ProblemKind& kind) { return std::string_view(kind.uri); });
    return found == kProblemKinds.end() ? nullptr : found;
}

} // namespace welcomer::accountserver
