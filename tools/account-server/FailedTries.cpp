#include "tools/account-server/FailedTries.h"

#include <algorithm>
#include <iterator>
#include <random>
#include <utility>

namespace welcomer::server {

namespace {

constexpr std::chrono::minutes kWindow{1};

std::string randomText() {
    std::random_device device;
    std::string text;
    for (int i = 0; i < 4; ++i) {
        text += std::to_string(device()) + ' ';
    }
    return text;
}

} // namespace

FailedTries::FailedTries(std::size_t maximumPairs, std::function<Clock::time_point()> now)
    : _maximumPairs(maximumPairs),
      _now(std::move(now)),
      _secret(randomText()) {}

std::chrono::seconds FailedTries::wait(std::string_view account, std::string_view address) {
    const std::size_t key = _key(account, address);
    const std::lock_guard lock(_mutex);
    return _wait(key, _now());
}

std::chrono::seconds FailedTries::add(std::string_view account, std::string_view address) {
    const std::size_t key = _key(account, address);
    const std::lock_guard lock(_mutex);
    const Clock::time_point now = _now();
    if (const std::chrono::seconds wait = _wait(key, now); wait.count() > 0) {
        return wait;
    }
    _forgetOld(now);
    const auto found = _byKey.find(key);
    if (found == _byKey.end()) {
        _pairs.push_back({key, {}, 0});
        _byKey.emplace(key, std::prev(_pairs.end()));
    } else {
        _pairs.splice(_pairs.end(), _pairs, found->second);
    }
    Pair& pair = _pairs.back();
    pair.failures[pair.count++ % kFailuresPerMinute] = now;
    while (_pairs.size() > _maximumPairs) {
        _byKey.erase(_pairs.front().key);
        _pairs.pop_front();
    }
    return {};
}

std::size_t FailedTries::size() {
    const std::lock_guard lock(_mutex);
    _forgetOld(_now());
    return _pairs.size();
}

std::chrono::seconds FailedTries::_wait(std::size_t key, Clock::time_point now) const {
    const auto found = _byKey.find(key);
    if (found == _byKey.end() || found->second->count < kFailuresPerMinute) {
        return {};
    }
    const Pair& pair = *found->second;
    const Clock::time_point oldest = pair.failures[pair.count % kFailuresPerMinute];
    const Clock::duration left = oldest + kWindow - now;
    return std::max(std::chrono::ceil<std::chrono::seconds>(left), std::chrono::seconds());
}

std::size_t FailedTries::_key(std::string_view account, std::string_view address) const {
    std::string text = _secret;
    text.append(account).push_back('\0');
    return std::hash<std::string>()(text.append(address));
}

void FailedTries::_forgetOld(Clock::time_point now) {
    while (!_pairs.empty()) {
        const Pair& pair = _pairs.front();
        if (pair.failures[(pair.count - 1) % kFailuresPerMinute] + kWindow > now) {
            return;
        }
        _byKey.erase(pair.key);
        _pairs.pop_front();
    }
}

} // namespace welcomer::server
