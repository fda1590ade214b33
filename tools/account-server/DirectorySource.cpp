#include "tools/account-server/DirectorySource.h"

#include "platform/AccountService.h"
#include "propertylist/Lookup.h"
#include "propertylist/PropertyListReadings.h"

#include <map>
#include <optional>
#include <utility>

namespace welcomer::server {

namespace {

using accountserver::AccountServiceEntry;
using accountserver::AuthenticateAnswer;
using accountserver::Problem;
using accountserver::ProblemType;

// As the account file has them.
constexpr char kCanBeEnabledKey[] = "CanBeEnabled";
constexpr char kPropertiesKey[] = "Properties";

std::map<std::string, AccountServiceEntry> servicesOf(const PropertyList::Dictionary& found) {
    std::map<std::string, AccountServiceEntry> services;
    for (const auto& [identifier, service] : found) {
        const PropertyList* const canBeEnabled = valueIn(service, kCanBeEnabledKey);
        const PropertyList::Dictionary* const properties = dictionaryIn(service, kPropertiesKey);
        services[identifier] = {!canBeEnabled || booleanReading(*canBeEnabled),
                                properties ? *properties : PropertyList::Dictionary()};
    }
    return services;
}

// The kind of a failure; none where the directory has it count as a success.
std::optional<ProblemType> problemTypeOf(const platform::SignInAnswer& answer) {
    const PropertyList* const error = valueIn(answer.contents, platform::kSKPropertyAccountError);
    switch (error ? integerIn(*error).value_or(-1) : -1) {
    case platform::kSKAccountErrorNone:
        return std::nullopt;
    case platform::kSKAccountErrorWrongPassword:
        return ProblemType::WrongPassword;
    case platform::kSKAccountErrorUnknownUser:
        return ProblemType::UnknownUser;
    case platform::kSKAccountErrorTermsOfService:
        return ProblemType::TermsOfService;
    case platform::kSKAccountErrorServerUnavailable:
        return ProblemType::Unavailable;
    case platform::kSKAccountErrorRepair:
        return ProblemType::Repair;
    default:
        return ProblemType::ServerError;
    }
}

// A failure, as its kind says; none where there is none.
std::optional<Problem> problemOf(const platform::SignInAnswer& answer) {
    const std::optional<ProblemType> type = answer.isCompleted ? std::nullopt : problemTypeOf(answer);
    if (!type) {
        return std::nullopt;
    }
    return Problem{*type, {}, {}, copyOf(valueIn(answer.contents, platform::kSKPropertyAccountErrorInfo))};
}

bool asksForTerms(const Problem& problem) {
    return problem.type == ProblemType::TermsOfService && problem.errorInfo;
}

} // namespace

SourceAnswer DirectorySource::authenticate(const std::string& user, const std::string& password) {
    const platform::SignInAnswer answer = _directory.answer(user, password, {});
    std::optional<Problem> problem = problemOf(answer);
    if (problem && !(asksForTerms(*problem) && _terms.has(user, *problem->errorInfo))) {
        return {std::move(*problem), {}, std::chrono::duration<double>(answer.delaySeconds)};
    }
    return _completed(user, answer);
}

SourceAnswer DirectorySource::acceptTerms(const std::string& user, const std::string& password,
                                          const PropertyList& terms) {
    const platform::SignInAnswer answer = _directory.answer(user, password, {});
    std::optional<Problem> problem = problemOf(answer);
    if (problem && !asksForTerms(*problem)) {
        return {std::move(*problem), {}, {}};
    }
    if (!_terms.canBeNoted()) {
        return {Problem{ProblemType::NotSupported, {}, {}, {}}, {}, {}};
    }
    if (problem && *problem->errorInfo != terms) {
        return {Problem{ProblemType::OtherTerms, {}, {}, std::move(problem->errorInfo)}, {}, {}};
    }
    if (problem) {
        if (const platform::Outcome noted = _terms.add(user, terms); !noted) {
            return {Problem{ProblemType::ServerError, noted.error.message, {}, {}}, {}, {}};
        }
    }
    return _completed(user, answer);
}

SourceAnswer DirectorySource::_completed(const std::string& user,
                                         const platform::SignInAnswer& answer) const {
    AuthenticateAnswer content;
    const PropertyList* const status = valueIn(answer.contents, platform::kStatusKey);
    content.status = status ? integerIn(*status).value_or(-1) : 0;
    content.accountID = user;
    content.delegates = copyOf(dictionaryIn(answer.contents, platform::kDelegatesKey));
    content.services = servicesOf(_directory.servicesOfNewAccount(user));
    return {std::move(content), {}, std::chrono::duration<double>(answer.delaySeconds)};
}

} // namespace welcomer::server
