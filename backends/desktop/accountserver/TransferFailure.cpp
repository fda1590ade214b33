#include "backends/desktop/accountserver/TransferFailure.h"

#include "propertylist/CalendarDate.h"
#include "propertylist/PropertyListReadError.h"

#include <cerrno>
#include <ctime>
#include <system_error>

namespace welcomer::desktop {

namespace {

constexpr std::string_view kUnix = "unix:";

// What the TLS library says of a certificate: numbers of its interface.
enum VerifyResult : long {
    kNotYetValid = 9,
    kExpired = 10,
    kSelfSigned = 18,
    kSelfSignedInChain = 19,
    kNoIssuer = 20,
    kNoIssuerOfFirst = 21,
    kRevoked = 23,
    kWrongHost = 62
};

std::string_view socketOf(const AccountServerSettings& settings) {
    return std::string_view(settings.address).substr(kUnix.size());
}

bool isSocket(const AccountServerSettings& settings) {
    return settings.address.starts_with(kUnix);
}

// Behind a text, what libcurl has to say.
std::string inBrackets(const std::string& explanation) {
    return explanation.empty() ? "" : " (" + excerpt(explanation.substr(0, explanation.find('\n'))) + ")";
}

std::string now() {
    return formatCalendarDate({static_cast<double>(std::time(nullptr))}).value_or("unknown");
}

std::string whyNotTrusted(const TransferFailure& failure, const AccountServerSettings& settings) {
    const std::string certificate = "the certificate of " + shownServer(settings);
    switch (failure.verifyResult) {
    case kNotYetValid:
        return certificate + " is not valid yet by this machine's clock, which says " + now() +
               ": set the clock";
    case kExpired:
        return certificate + " has expired by this machine's clock, which says " + now() +
               ": set the clock, or have the server's certificate renewed";
    case kSelfSigned:
    case kSelfSignedInChain:
    case kNoIssuer:
    case kNoIssuerOfFirst:
        return certificate + " is from an authority that is not known: install the authority's certificate, "
                             "or name it in the "
                             "setting AccountServerAuthority";
    case kRevoked:
        return certificate + " has been revoked: ask who runs the server";
    default:
        return failure.explanation.find("subject name") != std::string::npos ||
                       failure.verifyResult == kWrongHost
                   ? certificate +
                         " is for another host: a login page of this network may stand in between, or the "
                         "setting AccountServer is wrong"
                   : certificate + " is not accepted" + inBrackets(failure.explanation);
    }
}

std::string whyNotConnected(const TransferFailure& failure, const AccountServerSettings& settings) {
    const auto error = static_cast<int>(failure.systemError);
    const std::string message = error == 0 ? "" : ": " + std::generic_category().message(error);
    if (isSocket(settings)) {
        return error == EACCES ? "this user may not use " + shownServer(settings)
                               : "no account server listens on " + shownServer(settings) + message;
    }
    if (error == ENETUNREACH || error == EHOSTUNREACH || error == ENETDOWN) {
        return "there is no network connection to " + shownServer(settings) + message;
    }
    return "no server can be reached at " + shownServer(settings) + message;
}

std::string whyTooLate(const TransferFailure& failure, const AccountServerSettings& settings) {
    return failure.wasConnected
               ? shownServer(settings) + " has not answered within " +
                     std::to_string(settings.limit.count()) + " s"
               : "no connection to " + shownServer(settings) + " within " +
                     std::to_string(settings.connectLimit.count()) + " s: look at the network";
}

std::string whyNoTLS(const TransferFailure& failure, const AccountServerSettings& settings) {
    const bool isOld = failure.explanation.find("protocol") != std::string::npos ||
                       failure.explanation.find("handshake") != std::string::npos;
    return shownServer(settings) +
           (isOld ? " does not offer TLS 1.2 or newer" : " does not speak TLS there") +
           inBrackets(failure.explanation);
}

} // namespace

std::string shownServer(const AccountServerSettings& settings) {
    if (isSocket(settings)) {
        return "the socket " + std::string(socketOf(settings));
    }
    const std::string host = settings.address.substr(settings.address.find("//") + 2);
    return host.substr(0, host.find('/'));
}

std::string explain(const TransferFailure& failure, const AccountServerSettings& settings) {
    if (failure.isTooLong) {
        return "the answer of " + shownServer(settings) + " is too long";
    }
    switch (failure.code) {
    case CURLE_COULDNT_RESOLVE_HOST:
        return "the name of " + shownServer(settings) +
               " is not found: there is no network connection, or the name is wrong";
    case CURLE_COULDNT_RESOLVE_PROXY:
        return "the name of the proxy is not found" + inBrackets(failure.explanation);
    case CURLE_COULDNT_CONNECT:
        return whyNotConnected(failure, settings);
    case CURLE_OPERATION_TIMEDOUT:
        return whyTooLate(failure, settings);
    case CURLE_PEER_FAILED_VERIFICATION:
        return whyNotTrusted(failure, settings);
    case CURLE_SSL_CACERT_BADFILE:
        return "the authorities in " +
               (settings.authority.empty() ? "the system's file" : settings.authority) + " cannot be read";
    case CURLE_SSL_CONNECT_ERROR:
        return whyNoTLS(failure, settings);
    case CURLE_GOT_NOTHING:
    case CURLE_PARTIAL_FILE:
    case CURLE_RECV_ERROR:
    case CURLE_SEND_ERROR:
        return "the connection to " + shownServer(settings) + " broke off" + inBrackets(failure.explanation);
    case CURLE_UNSUPPORTED_PROTOCOL:
    case CURLE_WEIRD_SERVER_REPLY:
        return shownServer(settings) + " speaks something else than HTTP" + inBrackets(failure.explanation);
    case CURLE_ABORTED_BY_CALLBACK:
        return "the program ended before the answer of " + shownServer(settings);
    default:
        break;
    }
    return shownServer(settings) + " could not be asked: " + curl_easy_strerror(failure.code) +
           inBrackets(failure.explanation);
}

bool mayPass(const TransferFailure& failure) {
    switch (failure.code) {
    case CURLE_COULDNT_RESOLVE_HOST:
    case CURLE_COULDNT_RESOLVE_PROXY:
    case CURLE_COULDNT_CONNECT:
    case CURLE_OPERATION_TIMEDOUT:
    case CURLE_SSL_CONNECT_ERROR:
    case CURLE_GOT_NOTHING:
    case CURLE_RECV_ERROR:
    case CURLE_SEND_ERROR:
        return true;
    default:
        return false;
    }
}

} // namespace welcomer::desktop
