#include "tools/welcomer/login/DelegateReport.h"

#include "tools/welcomer/login/AgentTexts.h"

#include <algorithm>
#include <charconv>

namespace welcomer::tool {

namespace {

using namespace agenttext;
using Kind = DelegateOutcome::Kind;

// What the agent prints: digits, perhaps with a dot. Whoever may write to a syslog file may write anything else.
bool areSeconds(std::string_view text) {
    double value = 0;
    const char* const end = text.data() + text.size();
    const auto [position, error] = std::from_chars(text.data(), end, value);
    return error == std::errc() && position == end &&
           text.find_first_not_of("0123456789.") == std::string_view::npos;
}

bool readException(DelegateOutcome& delegate, std::string_view line) {
    const auto rest =
        after(line, std::string(kDelegateRaised) + delegate.identifier + std::string(kSecondsBegin));
    const std::size_t end = rest ? rest->find(kSecondsEnd) : std::string_view::npos;
    const auto reason = end == std::string_view::npos
                            ? std::nullopt
                            : after(rest->substr(end), std::string(kSecondsEnd) + ": ");
    if (!reason || !areSeconds(rest->substr(0, end))) {
        return false;
    }
    delegate.seconds = rest->substr(0, end);
    delegate.kind = Kind::Raised;
    delegate.reason = *reason;
    return true;
}

bool readAnswer(DelegateOutcome& delegate, std::string_view line) {
    auto answer = after(line, delegate.identifier + std::string(kAnsweredWithAliases));
    if (!answer) {
        answer = after(line, delegate.identifier + std::string(kAnswered));
    }
    // The last ones: the error before them may hold the like.
    const std::size_t begin = answer ? answer->rfind(kSecondsBegin) : std::string_view::npos;
    const auto seconds = begin == std::string_view::npos
                             ? std::nullopt
                             : between(answer->substr(begin), kSecondsBegin, kSecondsEnd);
    if (!seconds || !areSeconds(*seconds)) {
        return false;
    }
    delegate.seconds = *seconds;
    const std::string_view outcome = answer->substr(0, begin);
    delegate.kind = outcome == kCompleted ? Kind::Completed : Kind::Refused;
    delegate.reason = outcome == kCompleted ? "" : outcome;
    return true;
}

bool readProgress(DelegateOutcome& delegate, std::string_view line) {
    const auto progress = after(line, delegate.identifier + std::string(kProgress));
    if (progress) {
        delegate.progress = *progress;
    }
    return progress.has_value();
}

} // namespace

std::string DelegateOutcome::text() const {
    switch (kind) {
    case Kind::Working:
        return progress.empty() ? "working" : "working, " + progress;
    case Kind::NoResponse:
        return "no cached response";
    case Kind::Completed:
        return std::string(kCompleted);
    case Kind::Refused:
        return reason;
    case Kind::Raised:
        return "exception: " + reason;
    }
    return "";
}

bool DelegateReport::read(std::chrono::nanoseconds time, std::string_view line) {
    if (const auto beginning = after(line, kDelegateBegins)) {
        _delegates.push_back({.identifier = std::string(*beginning), .begin = time, .end = time});
        return true;
    }
    if (const auto without = after(line, kNoResponse)) {
        _delegates.push_back(
            {.identifier = std::string(*without), .kind = Kind::NoResponse, .begin = time, .end = time});
        return true;
    }
    for (DelegateOutcome& delegate : _delegates) {
        if (delegate.working() && readProgress(delegate, line)) {
            return true;
        }
        // The first outcome counts: a plug-in may still raise after its handler has run.
        if (delegate.working() && (readException(delegate, line) || readAnswer(delegate, line))) {
            delegate.end = time;
            return true;
        }
    }
    return false;
}

std::size_t DelegateReport::working() const {
    return static_cast<std::size_t>(
        std::ranges::count_if(_delegates, [](const auto& delegate) { return delegate.working(); }));
}

} // namespace welcomer::tool
