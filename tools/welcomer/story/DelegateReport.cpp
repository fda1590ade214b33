#include "tools/welcomer/story/DelegateReport.h"

#include <algorithm>

namespace welcomer::tool {

namespace {

constexpr std::string_view kSecondsBegin = " (";
constexpr std::string_view kSecondsEnd = " seconds)";

bool take(std::string_view& text, std::string_view prefix) {
    if (!text.starts_with(prefix)) {
        return false;
    }
    text.remove_prefix(prefix.size());
    return true;
}

} // namespace

void DelegateReport::read(std::string_view line) {
    std::string_view rest = line;
    if (take(rest, "setting up ")) {
        _delegates.push_back({std::string(rest), DelegateOutcome::kWorking, ""});
    } else if (take(rest, "no cached response for ")) {
        _delegates.push_back({std::string(rest), "no cached response", ""});
    } else {
        for (DelegateOutcome& delegate : _delegates) {
            // The first outcome counts: a plug-in may still raise after its handler has run.
            if (delegate.working() && _readOutcome(delegate, line)) {
                return;
            }
        }
    }
}

std::size_t DelegateReport::working() const {
    return static_cast<std::size_t>(std::count_if(_delegates.begin(), _delegates.end(),
                                                  [](const auto& delegate) { return delegate.working(); }));
}

bool DelegateReport::_readOutcome(DelegateOutcome& delegate, std::string_view line) {
    if (take(line,
             "exception in setup response for plugin " + delegate.identifier + std::string(kSecondsBegin))) {
        const std::size_t end = line.find(kSecondsEnd);
        std::string_view reason = line.substr(std::min(end, line.size()));
        if (!take(reason, std::string(kSecondsEnd) + ": ")) {
            return false;
        }
        delegate.seconds = line.substr(0, end);
        delegate.outcome = "exception: " + std::string(reason);
        return true;
    }
    if (!take(line, delegate.identifier + " setup+chosen: ") &&
        !take(line, delegate.identifier + " setup: ")) {
        return false;
    }
    const std::size_t begin = line.rfind(kSecondsBegin); // the error before it may hold the like
    if (begin == std::string_view::npos || !line.ends_with(kSecondsEnd)) {
        return false;
    }
    delegate.outcome = line.substr(0, begin);
    line.remove_prefix(begin + kSecondsBegin.size());
    delegate.seconds = line.substr(0, line.size() - kSecondsEnd.size());
    return true;
}

} // namespace welcomer::tool
