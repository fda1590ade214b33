#include "tools/account-server/LdapMapping.h"

#include "backends/accountserver/JSONPropertyList.h"
#include "platform/AccountService.h"
#include "propertylist/Characters.h"
#include "propertylist/Lookup.h"
#include "propertylist/PropertyListReadings.h"

#include <algorithm>
#include <optional>
#include <utility>

namespace welcomer::server {

namespace {

using accountserver::ContentType;
using accountserver::Problem;
using accountserver::ProblemType;

constexpr char kAccountErrorMember[] = "accountError";
constexpr char kErrorInfoMember[] = "errorInfo";

std::string lowerCase(std::string text) {
    std::ranges::transform(text, text.begin(), toLower);
    return text;
}

// A value of its member's type; none where it has another one.
std::optional<PropertyList> valueOf(const MappedMember& member, const std::vector<std::string>& values) {
    switch (member.type) {
    case MappedMember::Type::Texts:
        return PropertyList(PropertyList::Array(values.begin(), values.end()));
    case MappedMember::Type::Integer:
        if (const auto number = integerIn(PropertyList(values.front()))) {
            return PropertyList(*number);
        }
        return std::nullopt;
    case MappedMember::Type::Boolean:
        return PropertyList(equalsIgnoringCase(values.front(), "true"));
    case MappedMember::Type::Text:
        break;
    }
    return PropertyList(values.front());
}

// Puts a value where a path leads; false where something else is on the way.
bool put(PropertyList::Dictionary& members, const std::vector<std::string>& path, PropertyList value) {
    PropertyList::Dictionary* place = &members;
    for (auto key = path.begin(); key + 1 != path.end(); ++key) {
        place = (*place)[*key].dictionary();
        if (!place) {
            return false;
        }
    }
    place->insert_or_assign(path.back(), std::move(value));
    return true;
}

std::string shown(const MappedMember& member) {
    std::string text = member.attribute;
    for (const std::string& key : member.path) {
        text.append(text.empty() ? "" : "/").append(key);
    }
    return text;
}

Problem badMember(const std::string& why) {
    return {ProblemType::ServerError, "the directory's entry makes no answer: " + why, {}, {}};
}

std::optional<Problem> problemIn(const PropertyList::Dictionary& members) {
    const PropertyList* const error = valueIn(members, kAccountErrorMember);
    switch (error ? integerReading(*error) : platform::kSKAccountErrorNone) {
    case platform::kSKAccountErrorNone:
        return std::nullopt;
    case platform::kSKAccountErrorTermsOfService:
        return Problem{ProblemType::TermsOfService, {}, {}, copyOf(valueIn(members, kErrorInfoMember))};
    case platform::kSKAccountErrorRepair:
        return Problem{ProblemType::Repair, {}, {}, copyOf(valueIn(members, kErrorInfoMember))};
    default:
        return badMember("there is no such account error");
    }
}

// Whether the user has accepted the terms that a problem asks for.
bool areAccepted(const Problem& problem, const LdapAttributes& attributes,
                 const std::string& termsAttribute) {
    const auto note = attributes.find(lowerCase(termsAttribute));
    return problem.type == ProblemType::TermsOfService && problem.errorInfo && note != attributes.end() &&
           std::ranges::find(note->second, noteOfTerms(*problem.errorInfo)) != note->second.end();
}

} // namespace

std::string filterFor(std::string_view filter, std::string_view user) {
    std::string escaped;
    for (const char character : user) {
        if (std::string_view("*()\\\0", 5).find(character) != std::string_view::npos) {
            escaped += '\\';
            appendHex(escaped, static_cast<unsigned char>(character));
        } else {
            escaped += character;
        }
    }
    std::string result;
    while (!filter.empty()) {
        const std::size_t place = std::min(filter.find("%u"), filter.size());
        result.append(filter.substr(0, place));
        if (place < filter.size()) {
            result.append(escaped);
        }
        filter.remove_prefix(std::min(place + 2, filter.size()));
    }
    return result;
}

std::variant<accountserver::AuthenticateAnswer, Problem> answerOf(const std::string& user,
                                                                  const LdapAttributes& attributes,
                                                                  const std::vector<MappedMember>& members,
                                                                  const std::string& termsAttribute) {
    PropertyList::Dictionary answer{{"status", 0}, {"accountID", user}};
    for (const MappedMember& member : members) {
        std::vector<std::string> values{member.value};
        if (!member.attribute.empty()) {
            const auto found = attributes.find(lowerCase(member.attribute));
            if (found == attributes.end() || found->second.empty()) {
                continue;
            }
            values = found->second;
        }
        const std::optional<PropertyList> value = valueOf(member, values);
        if (!value || !put(answer, member.path, *value)) {
            return badMember(shown(member));
        }
    }
    if (auto problem = problemIn(answer); problem && !areAccepted(*problem, attributes, termsAttribute)) {
        return std::move(*problem);
    }
    // What an answer may be is known where answers are read.
    std::string why;
    const auto written = accountserver::writeJSON(PropertyList(std::move(answer)), &why);
    if (!written) {
        return badMember(why);
    }
    auto decoded = accountserver::decodeAuthenticateAnswer(*written, ContentType::JSON);
    if (!decoded) {
        return badMember(decoded.error);
    }
    return std::move(*decoded.message);
}

std::string noteOfTerms(const PropertyList& terms) {
    return accountserver::writeJSON(terms).value_or(""); // what comes from a directory is texts and numbers
}

} // namespace welcomer::server
