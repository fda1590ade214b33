#include "backends/desktop/accountserver/ReplyReading.h"

#include "backends/accountserver/SignInAnswers.h"
#include "propertylist/PropertyListReadError.h"

#include <optional>

namespace welcomer::desktop {

namespace {

constexpr long kNetworkAuthenticationRequired = 511;

bool isRedirect(const Reply& reply) {
    return reply.status >= 300 && reply.status < 400;
}

// Of a front that reaches no server behind it.
bool isFrontsOwn(const Reply& reply) {
    return reply.status >= 502 && reply.status <= 504;
}

template <class Message>
using Decode = accountserver::Decoded<Message> (*)(std::string_view body, accountserver::ContentType type);

template <class Message>
accountserver::Decoded<Message> read(const Reply& reply, Decode<Message> decode) {
    const auto type = accountserver::contentTypeNamed(reply.contentType);
    if (!type) {
        return {std::nullopt, reply.contentType.empty() ? "its answer has no type"
                                                        : "its answer is " + excerpt(reply.contentType)};
    }
    return decode(reply.body, *type);
}

} // namespace

accountserver::Decoded<accountserver::AuthenticateAnswer> readAnswer(const Reply& reply) {
    return read<accountserver::AuthenticateAnswer>(reply, accountserver::decodeAuthenticateAnswer);
}

accountserver::Decoded<accountserver::ServerDescription> readDescription(const Reply& reply) {
    return read<accountserver::ServerDescription>(reply, accountserver::decodeServerDescription);
}

platform::SignInAnswer readFailure(const Reply& reply, const std::string& server) {
    std::string why = "HTTP status " + std::to_string(reply.status);
    if (const auto type = accountserver::contentTypeNamed(reply.contentType); type && reply.status >= 400) {
        const auto problem = accountserver::decodeProblem(reply.body, *type, static_cast<int>(reply.status));
        if (problem) {
            return accountserver::signInAnswerOf(*problem.message, reply.retryAfter);
        }
        why += ", " + problem.error;
    }
    if (isFrontsOwn(reply)) {
        return accountserver::unavailable(server + " reaches no account server behind it (" + why +
                                          "): try again later");
    }
    return accountserver::unavailable(describeStranger(reply, server, why));
}

std::string describeStranger(const Reply& reply, const std::string& server, const std::string& why) {
    if (isRedirect(reply)) {
        return server + " sends on to " + (reply.location.empty() ? "nowhere" : excerpt(reply.location)) +
               ", where no password is sent: a login page of this network may stand in between, or the "
               "setting "
               "AccountServer is wrong";
    }
    if (reply.status == kNetworkAuthenticationRequired || reply.contentType.starts_with("text/html")) {
        return server + " shows a web page (" + why +
               "): a login page of this network may stand in between, or the setting AccountServer is wrong";
    }
    return server + " does not speak the account server's protocol: " + why;
}

} // namespace welcomer::desktop
