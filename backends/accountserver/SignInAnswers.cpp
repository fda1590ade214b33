#include "backends/accountserver/SignInAnswers.h"

#include "platform/AccountService.h"

namespace welcomer::accountserver {

namespace {

// Of a service in an account, as the account file has it.
constexpr char kCanBeEnabledKey[] = "CanBeEnabled";
constexpr char kPropertiesKey[] = "Properties";

// What the error info of a problem is, where it has any.
std::optional<PropertyList> infoOf(const Problem& problem, std::optional<std::int64_t> retryAfter) {
    switch (problem.type) {
    case ProblemType::TermsOfService:
    case ProblemType::OtherTerms:
    case ProblemType::Repair:
        return problem.errorInfo;
    case ProblemType::WrongPassword:
    case ProblemType::UnknownUser:
        return std::nullopt;
    default:
        break;
    }
    std::string text = problem.detail.empty() ? kindOf(problem.type).title : problem.detail;
    if (problem.type == ProblemType::TooManyTries && retryAfter) {
        text += "; try again in " + std::to_string(*retryAfter) + " s";
    }
    return text;
}

} // namespace

platform::SignInAnswer signInAnswerOf(const AuthenticateAnswer& answer) {
    PropertyList::Dictionary contents{{platform::kStatusKey, answer.status},
                                      {platform::kSKPropertyAccountID, answer.accountID}};
    if (answer.delegates) {
        contents[platform::kDelegatesKey] = *answer.delegates;
    }
    return {true, std::move(contents), 0};
}

platform::SignInAnswer signInAnswerOf(const Problem& problem, std::optional<std::int64_t> retryAfter) {
    PropertyList::Dictionary contents{{platform::kSKPropertyAccountError, kindOf(problem.type).accountError}};
    if (auto info = infoOf(problem, retryAfter)) {
        contents[platform::kSKPropertyAccountErrorInfo] = *std::move(info);
    }
    return {false, std::move(contents), 0};
}

platform::SignInAnswer unavailable(const std::string& why) {
    return {false,
            {{platform::kSKPropertyAccountError, platform::kSKAccountErrorServerUnavailable},
             {platform::kSKPropertyAccountErrorInfo, why}},
            0};
}

PropertyList::Dictionary servicesOf(const AuthenticateAnswer& answer) {
    PropertyList::Dictionary services;
    if (answer.services) {
        for (const auto& [identifier, entry] : *answer.services) {
            services[identifier] = PropertyList::Dictionary{{kCanBeEnabledKey, entry.canBeEnabled},
                                                            {kPropertiesKey, entry.properties}};
        }
    } else {
        for (const char* identifier : platform::kSKServiceIDs) {
            services[identifier] = PropertyList::Dictionary{{kPropertiesKey, PropertyList::Dictionary{}}};
        }
    }
    const auto mail = services.find(platform::kSKServiceIDMail);
    if (mail != services.end() && answer.mailAddress) {
        // One that stands among the service's own properties already stays.
        (*mail->second.dictionary())[kPropertiesKey].dictionary()->emplace(
            platform::kSKPropertyMailEmailAddress, *answer.mailAddress);
    }
    return services;
}

} // namespace welcomer::accountserver
