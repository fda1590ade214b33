#include "tools/welcomer/login/ServiceReport.h"

#include "platform/AccountService.h"
#include "tools/welcomer/login/AgentTexts.h"

#include <algorithm>
#include <array>

namespace welcomer::tool {

namespace {

using namespace agenttext;
using Kind = ServiceOutcome::Kind;

// A service that lines speak of by a name of its own.
struct NamedService {
    std::string_view name;
    const char* identifier;
};
constexpr std::array kNamedServices{NamedService{"Locator", platform::kSKServiceIDLOC},
                                    NamedService{"Mail", platform::kSKServiceIDMail},
                                    NamedService{"Notes", platform::kSKServiceIDNotes},
                                    NamedService{"Documents & Data", platform::kSKServiceMobileDocuments}};

// The identifier that a name stands for; none for a name that is none.
std::optional<std::string_view> identified(std::optional<std::string_view> name) {
    const auto* const found = std::ranges::find(kNamedServices, name.value_or(""), &NamedService::name);
    return found == kNamedServices.end() ? std::nullopt : std::optional<std::string_view>(found->identifier);
}

// The service whose name a line gives when it is turned on: mail's address follows its name.
std::optional<std::string_view> namedOn(std::string_view line) {
    const auto rest = after(line, kNamedOn);
    return rest ? identified(rest->substr(0, rest->find(':'))) : std::nullopt;
}

// The service that a line says was not turned on.
std::optional<std::string_view> refused(std::string_view line) {
    if (line == kMailWithoutAddress) {
        return platform::kSKServiceIDMail;
    }
    if (line == kNotesWithoutAddress) {
        return platform::kSKServiceIDNotes;
    }
    if (const auto identifier = between(line, kServiceRefused, kServiceRefusedEnd)) {
        return identifier;
    }
    const auto named = identified(between(line, kNamedRefused, kNamedRefusedEnd));
    return named ? named : identified(between(line, kNamedMissing, kNamedMissingEnd));
}

// The service that a line puts off.
std::optional<std::string_view> putOff(std::string_view line) {
    const auto rest = between(line, kServicePutOff, kServicePutOffEnd);
    const std::size_t end = rest ? rest->find(kServicePutOffMiddle) : std::string_view::npos;
    return end == std::string_view::npos ? std::nullopt : std::optional(rest->substr(0, end));
}

} // namespace

std::string ServiceOutcome::text() const {
    switch (kind) {
    case Kind::Enabled:
        return "enabled";
    case Kind::PutOff:
        return "put off, and not enabled";
    case Kind::Refused:
        return reason;
    case Kind::OfSetup:
        return "left to setup";
    }
    return "";
}

bool ServiceReport::read(std::chrono::nanoseconds time, std::string_view line) {
    if (const auto identifier = between(line, kServiceOn, kServiceOnEnd)) {
        _settle(time, *identifier, Kind::Enabled);
    } else if (const auto later = putOff(line)) {
        _settle(time, *later, Kind::PutOff);
    } else if (const auto named = namedOn(line)) {
        _settle(time, *named, Kind::Enabled);
    } else if (const auto unable = refused(line)) {
        _settle(time, *unable, Kind::Refused, line);
    } else if (const auto other = between(line, "", kOfOtherPhaseEnd)) {
        _settle(time, *other, Kind::OfSetup);
    } else {
        return false;
    }
    return true;
}

void ServiceReport::_settle(std::chrono::nanoseconds time, std::string_view identifier, Kind kind,
                            std::string_view reason) {
    auto found = std::ranges::find(_services, identifier, &ServiceOutcome::identifier);
    if (found == _services.end()) {
        found = _services.insert(found, {.identifier = std::string(identifier), .named = time});
    }
    found->kind = kind;
    found->reason = reason;
    found->settled = time;
}

} // namespace welcomer::tool
