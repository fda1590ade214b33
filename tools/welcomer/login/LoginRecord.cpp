#include "tools/welcomer/login/LoginRecord.h"

#include "tools/welcomer/login/AgentTexts.h"

#include <algorithm>
#include <array>
#include <charconv>

namespace welcomer::tool {

namespace {

using namespace agenttext;

constexpr std::array kFailures{kFileStays,     kItemUnreadable, kItemStays,
                               kNoAccountName, kNoAccount,      kNotKilled,
                               kStepRaised,    kPluginRefused,  kPluginWithoutIdentifier};

std::optional<std::int32_t> number(std::string_view text) {
    std::int32_t value = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
    return error == std::errc() && end == text.data() + text.size() ? std::optional(value) : std::nullopt;
}

} // namespace

bool LoginRecord::read(std::chrono::nanoseconds time, std::string_view line) {
    _last = time;
    if (_delegates.read(time, line)) {
        if (line.starts_with(kDelegateBegins) && !_waiting) {
            _waiting = time;
        }
    } else if (line == kLinger) {
        _waiting = _waiting.value_or(time);
        _lingering = time;
    } else if (const auto account = after(line, kAccountName)) {
        _account = *account;
    } else {
        return _readEnd(line) || _readFailure(line) || _services.read(time, line);
    }
    return true;
}

bool LoginRecord::_readEnd(std::string_view line) {
    if (line == kEnd) {
        _end = End::Ended;
    } else if (line.starts_with(kEndedByPlugin) || line.starts_with(kEndedOutside)) {
        _end = End::Broken;
        _endReason = line;
    } else {
        return false;
    }
    return true;
}

bool LoginRecord::_readFailure(std::string_view line) {
    if (const auto status = after(line, kItemNotFound)) {
        _itemStatus = number(*status);
    } else if (std::ranges::any_of(kFailures, [&](auto each) { return line.starts_with(each); })) {
        _failures.emplace_back(line);
    } else {
        return false;
    }
    return true;
}

} // namespace welcomer::tool
