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
    kNoRevocations = 3,
    kNotYetValid = 9,
    kExpired = 10,
    kRevocationsNotYetValid = 11,
    kRevocationsExpired = 12,
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
        return certificate +
               " is from an authority that is not known: a login page of this network may stand "
               "in between, or the authority is to be named in the setting AccountServerAuthority";
    case kRevoked:
        return certificate + ", or that of its authority, has been revoked: ask who runs the server";
    case kNoRevocations:
        return certificate + " is from an authority of which " + settings.revocations +
               " has no list of what it has revoked: add it, or change the setting AccountServerRevocations";
    case kRevocationsNotYetValid:
    case kRevocationsExpired:
        return "the list in " + settings.revocations + " of what the authority of " + shownServer(settings) +
               " has revoked is not of today by this machine's clock, which says " + now() +
               ": set the clock, or get the authority's newest list";
    default:
        return failure.explanation.find("subject name") != std::string::npos ||
                       failure.verifyResult == kWrongHost
                   ? certificate +
                         " is for another host: a login page of this network may stand in between, or the "
                         "setting AccountServer is wrong"
                   : certificate + " is not accepted" + inBrackets(failure.explanation);
    }
}

// Whether a proxy has answered, and has not connected.
bool isRefusedByProxy(const TransferFailure& failure) {
    return failure.proxyStatus >= 300;
}

// Who a connection was to be made with that is not the server: a proxy, of the desktop or of the environment.
//  result  as libcurl names it: "proxy.example port 3128"; empty where it names the server, or nobody
std::string proxyIn(const TransferFailure& failure, const AccountServerSettings& settings) {
    constexpr std::string_view begin = "Failed to connect to ";
    constexpr std::string_view port = " port ";
    const std::size_t end = failure.explanation.find(" after ");
    if (!failure.explanation.starts_with(begin) || end == std::string::npos) {
        return "";
    }
    const std::string named = failure.explanation.substr(begin.size(), end - begin.size());
    const std::string server = shownServer(settings);
    const std::size_t colon = server.find(':');
    const bool isServer = named == server.substr(0, colon) + std::string(port) +
                                       (colon == std::string::npos ? "443" : server.substr(colon + 1));
    return isServer || named.find(port) == std::string::npos ? "" : excerpt(named);
}

std::string whyNoProxy(const TransferFailure& failure, const AccountServerSettings& settings) {
    constexpr long wantsName = 407;
    const std::string status = "HTTP status " + std::to_string(failure.proxyStatus);
    return failure.proxyStatus == wantsName
               ? "the network's proxy wants a name and a password (" + status +
                     "): give them in the network's settings"
               : "the network's proxy does not connect to " + shownServer(settings) + " (" + status +
                     "): ask who runs the network";
}

std::string whyNotConnected(const TransferFailure& failure, const AccountServerSettings& settings) {
    const auto error = static_cast<int>(failure.systemError);
    const std::string message = error == 0 ? "" : ": " + std::generic_category().message(error);
    if (isSocket(settings)) {
        return error == EACCES ? "this user may not use " + shownServer(settings)
                               : "no account server listens on " + shownServer(settings) + message;
    }
    if (const std::string proxy = proxyIn(failure, settings); !proxy.empty()) {
        return "the network's proxy cannot be reached at " + proxy + message +
               ": look at the proxy in the network's settings";
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
    if (failure.explanation.find("SSL_ERROR_SYSCALL") != std::string::npos ||
        failure.explanation.find("reset by peer") != std::string::npos ||
        failure.explanation.find("unexpected eof") != std::string::npos) {
        return "the connection to " + shownServer(settings) +
               " broke off before it was secured: a firewall of this network may stand in between" +
               inBrackets(failure.explanation);
    }
    const bool isOld = failure.explanation.find("protocol") != std::string::npos ||
                       failure.explanation.find("handshake") != std::string::npos;
    return shownServer(settings) +
           (isOld ? " does not offer TLS 1.2 or newer" : " does not speak TLS there") +
           inBrackets(failure.explanation);
}

} // namespace

bool isSocket(const AccountServerSettings& settings) {
    return settings.address.starts_with(kUnix);
}

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
    if (isRefusedByProxy(failure)) {
        return whyNoProxy(failure, settings);
    }
    switch (failure.code) {
    case CURLE_OK:
        return "the connection to " + shownServer(settings) +
               " broke off (the answer does not say how long it is)";
    case CURLE_COULDNT_RESOLVE_HOST:
        return "the name of " + shownServer(settings) +
               " is not found: there is no network connection, or the name is wrong";
    case CURLE_COULDNT_RESOLVE_PROXY:
        return "the name of the network's proxy is not found" + inBrackets(failure.explanation) +
               ": look at the proxy in the network's settings";
    case CURLE_PROXY:
        return "the network's proxy does not connect to " + shownServer(settings) +
               inBrackets(failure.explanation) + ": ask who runs the network";
    case CURLE_COULDNT_CONNECT:
        return whyNotConnected(failure, settings);
    case CURLE_OPERATION_TIMEDOUT:
        return whyTooLate(failure, settings);
    case CURLE_PEER_FAILED_VERIFICATION:
        return whyNotTrusted(failure, settings);
    case CURLE_SSL_CACERT_BADFILE:
        return "the authorities in " +
               (settings.authority.empty() ? "the system's file" : settings.authority) + " cannot be read";
    case CURLE_SSL_CRL_BADFILE:
        return "the list of what is revoked in " + settings.revocations + " cannot be read";
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
    if (isRefusedByProxy(failure)) {
        return failure.proxyStatus >= 500; // a proxy whose own network has trouble
    }
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
