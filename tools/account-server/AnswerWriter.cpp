#include "tools/account-server/AnswerWriter.h"

#include "propertylist/Characters.h"
#include "tools/account-server/Words.h"

#include <optional>

namespace welcomer::server {

namespace {

using accountserver::ContentType;
using accountserver::Problem;
using accountserver::ProblemType;

// Whether the parameters behind a type say that it is not taken at all: "q=0", "q=0.000".
bool isRefused(std::string_view parameters) {
    while (!parameters.empty()) {
        const std::string_view parameter = takeUntil(parameters, ';');
        if (parameter.size() > 2 && equalsIgnoringCase(parameter.substr(0, 2), "q=")) {
            return parameter.find_first_not_of("0.", 2) == std::string_view::npos;
        }
    }
    return false;
}

const char* nameOf(ContentType type) {
    return type == ContentType::JSON ? accountserver::kJSONContentType
                                     : accountserver::kPropertyListContentType;
}

bool takes(const AcceptedForms& accepted, ContentType type) {
    return type == ContentType::JSON ? accepted.json : accepted.propertyList;
}

// Says why a form that is accepted cannot be used, where that is the reason.
template <class Message>
std::optional<Answer> write(const Message& message, const AcceptedForms& accepted, ContentType first,
                            std::string& why) {
    const ContentType second = first == ContentType::JSON ? ContentType::PropertyList : ContentType::JSON;
    for (const ContentType type : {first, second}) {
        if (takes(accepted, type)) {
            if (auto body = encode(message, type, &why)) {
                return Answer{200, nameOf(type), std::move(*body), {}, {}};
            }
        }
    }
    return std::nullopt;
}

} // namespace

AcceptedForms::AcceptedForms(std::string_view field) {
    const bool takesAll = withoutBlanks(field).empty();
    json = propertyList = problem = takesAll;
    // What names a type holds over what names many.
    for (const bool isForMany : {true, false}) {
        for (std::string_view rest = field; !rest.empty();) {
            std::string_view range = takeUntil(rest, ',');
            const std::string_view type = takeUntil(range, ';');
            const bool isMany = type == "*/*" || equalsIgnoringCase(type, "application/*");
            const bool isTaken = !isRefused(range);
            const auto set = [&](bool& form, std::string_view name) {
                if (isMany == isForMany && (isMany || equalsIgnoringCase(type, name))) {
                    form = isTaken;
                }
            };
            set(json, accountserver::kJSONContentType);
            set(propertyList, accountserver::kPropertyListContentType);
            set(problem, accountserver::kProblemContentType);
        }
    }
}

Answer writeAnswer(const accountserver::AuthenticateAnswer& answer, const std::string& requestID,
                   const AcceptedForms& accepted, ContentType first) {
    std::string why;
    if (auto written = write(answer, accepted, first, why)) {
        return std::move(*written);
    }
    return writeProblem({ProblemType::NotAcceptable, why, requestID, {}}, accepted);
}

Answer writeAnswer(const accountserver::ServerDescription& description, const AcceptedForms& accepted) {
    std::string why;
    auto written = write(description, accepted, ContentType::JSON, why);
    return written ? std::move(*written) : writeProblem({ProblemType::NotAcceptable, why, {}, {}}, accepted);
}

Answer writeProblem(const Problem& problem, const AcceptedForms& accepted) {
    std::string why;
    const auto status = static_cast<unsigned>(accountserver::kindOf(problem.type).httpStatus);
    // A client that takes nothing of ours is told so all the same.
    const bool takesJSON = accepted.problem || accepted.json || !accepted.propertyList;
    if (auto body = takesJSON ? encode(problem, ContentType::JSON, &why) : std::nullopt) {
        return {status, accountserver::kProblemContentType, std::move(*body), {}, {}};
    }
    if (auto body = accepted.propertyList ? encode(problem, ContentType::PropertyList, &why) : std::nullopt) {
        return {status, accountserver::kPropertyListContentType, std::move(*body), {}, {}};
    }
    // Without what cannot be written there is nothing that could fail.
    return writeProblem(
        {ProblemType::NotAcceptable, problem.errorInfo ? why : std::string(), problem.requestID, {}},
        accepted);
}

} // namespace welcomer::server
