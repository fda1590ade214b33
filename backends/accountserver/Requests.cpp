#include "backends/accountserver/JSONPropertyList.h"
#include "backends/accountserver/Members.h"
#include "backends/accountserver/Messages.h"
#include "propertylist/UTF8.h"

#include <algorithm>
#include <utility>

namespace welcomer::accountserver {

namespace {

constexpr char kRequestIDMember[] = "requestID";
constexpr char kUserMember[] = "user";
constexpr char kPasswordMember[] = "password";
constexpr char kDelegatesRequestMember[] = "delegatesRequest";
constexpr char kTermsMember[] = "terms";
constexpr char kMachineMember[] = "machine";
constexpr char kProductMember[] = "product";
constexpr char kVersionMember[] = "version";
constexpr char kLocaleMember[] = "locale";

bool isRequestID(std::string_view text) {
    return std::ranges::all_of(text, [](char each) {
        return (each >= 'a' && each <= 'z') || (each >= 'A' && each <= 'Z') || (each >= '0' && each <= '9') ||
               each == '-';
    });
}

PropertyList::Dictionary membersOf(const AuthenticateRequest& request) {
    return {{kDelegatesRequestMember, request.delegatesRequest}};
}

PropertyList::Dictionary membersOf(const AcceptTermsRequest& request) {
    return {{kTermsMember, request.terms}};
}

PropertyList::Dictionary withSender(PropertyList::Dictionary members, const Sender& sender) {
    members[kRequestIDMember] = sender.requestID;
    members[kUserMember] = sender.user;
    members[kMachineMember] = PropertyList::Dictionary{{kProductMember, sender.machine.product},
                                                       {kVersionMember, sender.machine.version},
                                                       {kLocaleMember, sender.machine.locale}};
    return members;
}

Sender takeSender(Members& members) {
    Sender sender;
    sender.requestID = members.boundedText(kRequestIDMember, 1, kMaximumRequestIDSize);
    if (!isRequestID(sender.requestID)) {
        members.refuse("the member requestID holds something else than letters, digits and hyphens");
    }
    sender.user = members.boundedText(kUserMember, 1, kMaximumUserSize);
    Members machine = members.object(kMachineMember);
    sender.machine.product = machine.text(kProductMember);
    sender.machine.version = machine.text(kVersionMember);
    sender.machine.locale = machine.text(kLocaleMember);
    members.check(machine);
    return sender;
}

// The password is the first member: what comes before it is always the same.
template <class Request>
std::optional<AroundPassword> around(const Request& request, ContentType type, std::string* error) {
    const auto body = encodeMembers(withSender(membersOf(request), request.sender), type, error);
    if (!body) {
        return std::nullopt;
    }
    if (type == ContentType::JSON) {
        return AroundPassword{"{\"password\":\"", "\"," + body->substr(1)};
    }
    constexpr std::string_view opening = "<dict>\n";
    const std::size_t first = body->find(opening) + opening.size();
    return AroundPassword{body->substr(0, first) + "<key>password</key>\n<string>",
                          "</string>\n" + body->substr(first)};
}

template <class Request>
std::optional<std::string> encodeWhole(const Request& request, std::string_view password, ContentType type,
                                       std::string* error) {
    if (const char* const why = whyNotSendable(password, type)) {
        if (error) {
            *error = why;
        }
        return std::nullopt;
    }
    auto parts = around(request, type, error);
    if (!parts) {
        return std::nullopt;
    }
    std::string body = std::move(parts->before);
    escapePassword(password, type, [&](std::string_view piece) { body += piece; });
    return body + parts->after;
}

// What is left of the members is the request's own.
template <class Request, class Take>
Decoded<WithPassword<Request>> decode(std::string_view body, ContentType type, const Take& take) {
    Members members(body, type);
    WithPassword<Request> message;
    if (members.error().empty()) {
        message.request.sender = takeSender(members);
        message.password = members.boundedText(kPasswordMember, 0, kMaximumPasswordSize);
        take(members, message.request);
    }
    if (!members.error().empty()) {
        return {std::nullopt, members.error()};
    }
    return {std::move(message), ""};
}

} // namespace

std::optional<AroundPassword> encodeAroundPassword(const AuthenticateRequest& request, ContentType type,
                                                   std::string* error) {
    return around(request, type, error);
}

std::optional<AroundPassword> encodeAroundPassword(const AcceptTermsRequest& request, ContentType type,
                                                   std::string* error) {
    return around(request, type, error);
}

const char* whyNotSendable(std::string_view password, ContentType type) {
    if (password.size() > kMaximumPasswordSize) {
        return "the password is too long";
    }
    if (findInvalidUTF8(password) != std::string_view::npos) {
        return "the password holds invalid UTF-8";
    }
    if (type == ContentType::PropertyList && findInvalidXMLText(password) != std::string_view::npos) {
        return "the password holds a character for which XML has no place";
    }
    return nullptr;
}

void escapePassword(std::string_view password, ContentType type,
                    const std::function<void(std::string_view piece)>& append) {
    if (type == ContentType::JSON) {
        escapeJSON(password, append);
        return;
    }
    for (std::size_t i = 0; i < password.size(); ++i) {
        const char each = password[i];
        append(each == '&'    ? "&amp;"
               : each == '<'  ? "&lt;"
               : each == '>'  ? "&gt;"
               : each == '\r' ? "&#13;"
                              : password.substr(i, 1));
    }
}

std::optional<std::string> encode(const AuthenticateRequest& request, std::string_view password,
                                  ContentType type, std::string* error) {
    return encodeWhole(request, password, type, error);
}

std::optional<std::string> encode(const AcceptTermsRequest& request, std::string_view password,
                                  ContentType type, std::string* error) {
    return encodeWhole(request, password, type, error);
}

Decoded<WithPassword<AuthenticateRequest>> decodeAuthenticateRequest(std::string_view body,
                                                                     ContentType type) {
    return decode<AuthenticateRequest>(body, type, [](Members& members, AuthenticateRequest& request) {
        request.delegatesRequest = members.dictionary(kDelegatesRequestMember);
    });
}

Decoded<WithPassword<AcceptTermsRequest>> decodeAcceptTermsRequest(std::string_view body, ContentType type) {
    return decode<AcceptTermsRequest>(body, type, [](Members& members, AcceptTermsRequest& request) {
        request.terms = members.value(kTermsMember);
    });
}

} // namespace welcomer::accountserver
