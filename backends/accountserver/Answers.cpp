#include "backends/accountserver/Members.h"
#include "backends/accountserver/Messages.h"
#include "propertylist/PropertyListReadError.h"

#include <utility>

namespace welcomer::accountserver {

namespace {

constexpr char kStatusMember[] = "status";
constexpr char kAccountIDMember[] = "accountID";
constexpr char kDelegatesMember[] = "delegates";
constexpr char kMailAddressMember[] = "mailAddress";
constexpr char kServicesMember[] = "services";
constexpr char kCanBeEnabledMember[] = "canBeEnabled";
constexpr char kPropertiesMember[] = "properties";
constexpr char kTypeMember[] = "type";
constexpr char kTitleMember[] = "title";
constexpr char kDetailMember[] = "detail";
constexpr char kInstanceMember[] = "instance";
constexpr char kErrorInfoMember[] = "errorInfo";
constexpr char kServerMember[] = "server";
constexpr char kVersionMember[] = "version";

constexpr std::string_view kInstancePrefix = "urn:welcomer:request:";

PropertyList::Dictionary encoded(const std::map<std::string, AccountServiceEntry>& services) {
    PropertyList::Dictionary all;
    for (const auto& [identifier, service] : services) {
        PropertyList::Dictionary members{{kCanBeEnabledMember, service.canBeEnabled}};
        if (!service.properties.empty()) {
            members[kPropertiesMember] = service.properties;
        }
        all[identifier] = std::move(members);
    }
    return all;
}

std::map<std::string, AccountServiceEntry> takeServices(Members& members,
                                                        const PropertyList::Dictionary& all) {
    std::map<std::string, AccountServiceEntry> services;
    for (const auto& [identifier, value] : all) {
        const std::string path = std::string(kServicesMember) + "/" + excerpt(identifier);
        if (!value.isDictionary()) {
            members.refuse("the member " + path + " is no object");
            continue;
        }
        Members service(*value.dictionary(), path + "/");
        services[identifier] = {
            service.optionalBoolean(kCanBeEnabledMember).value_or(true),
            service.optionalDictionary(kPropertiesMember).value_or(PropertyList::Dictionary())};
        members.check(service);
    }
    return services;
}

AuthenticateAnswer takeAnswer(Members& members) {
    AuthenticateAnswer answer;
    answer.status = members.integer(kStatusMember);
    answer.accountID = members.text(kAccountIDMember);
    answer.delegates = members.optionalDictionary(kDelegatesMember);
    answer.mailAddress = members.optionalText(kMailAddressMember);
    if (const auto services = members.optionalDictionary(kServicesMember)) {
        answer.services = takeServices(members, *services);
    }
    return answer;
}

Problem takeProblem(Members& members, int httpStatus) {
    Problem problem;
    const std::string uri = members.text(kTypeMember);
    const ProblemKind* const kind = kindWithURI(uri);
    if (!kind) {
        members.refuse("the problem is of no type that is known");
        return problem;
    }
    if (kind->httpStatus != httpStatus) {
        members.refuse(uri + " comes with the HTTP status " + std::to_string(httpStatus));
    }
    problem.type = kind->type;
    problem.detail = members.optionalText(kDetailMember).value_or("");
    const std::string instance = members.optionalText(kInstanceMember).value_or("");
    if (instance.starts_with(kInstancePrefix)) {
        problem.requestID = instance.substr(kInstancePrefix.size());
    }
    problem.errorInfo = members.optionalValue(kErrorInfoMember);
    return problem;
}

template <class Take>
auto decode(std::string_view body, ContentType type, const Take& take)
    -> Decoded<decltype(take(std::declval<Members&>()))> {
    Members members(body, type);
    if (members.error().empty()) {
        auto message = take(members);
        if (members.error().empty()) {
            return {std::move(message), ""};
        }
    }
    return {std::nullopt, members.error()};
}

} // namespace

std::optional<std::string> encode(const AuthenticateAnswer& answer, ContentType type, std::string* error) {
    PropertyList::Dictionary members{{kStatusMember, answer.status}, {kAccountIDMember, answer.accountID}};
    if (answer.delegates) {
        members[kDelegatesMember] = *answer.delegates;
    }
    if (answer.mailAddress) {
        members[kMailAddressMember] = *answer.mailAddress;
    }
    if (answer.services) {
        members[kServicesMember] = encoded(*answer.services);
    }
    return encodeMembers(members, type, error);
}

std::optional<std::string> encode(const Problem& problem, ContentType type, std::string* error) {
    const ProblemKind& kind = kindOf(problem.type);
    PropertyList::Dictionary members{
        {kTypeMember, kind.uri}, {kTitleMember, kind.title}, {kStatusMember, kind.httpStatus}};
    if (!problem.detail.empty()) {
        members[kDetailMember] = problem.detail;
    }
    if (!problem.requestID.empty()) {
        members[kInstanceMember] = std::string(kInstancePrefix) + problem.requestID;
    }
    if (problem.errorInfo) {
        members[kErrorInfoMember] = *problem.errorInfo;
    }
    return encodeMembers(members, type, error);
}

std::optional<std::string> encode(const ServerDescription& description, ContentType type,
                                  std::string* error) {
    return encodeMembers({{kServerMember, description.server}, {kVersionMember, description.version}}, type,
                         error);
}

Decoded<AuthenticateAnswer> decodeAuthenticateAnswer(std::string_view body, ContentType type) {
    return decode(body, type, takeAnswer);
}

Decoded<Problem> decodeProblem(std::string_view body, ContentType type, int httpStatus) {
    return decode(body, type, [&](Members& members) { return takeProblem(members, httpStatus); });
}

Decoded<ServerDescription> decodeServerDescription(std::string_view body, ContentType type) {
    return decode(body, type, [](Members& members) {
        return ServerDescription{members.text(kServerMember), members.text(kVersionMember)};
    });
}

} // namespace welcomer::accountserver
