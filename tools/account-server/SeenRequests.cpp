#include "tools/account-server/SeenRequests.h"

#include <gnutls/crypto.h>
#include <stdexcept>

namespace welcomer::server {

SeenRequests::SeenRequests(std::size_t maximum, std::function<Clock::time_point()> now)
    : _maximum(maximum),
      _now(std::move(now)) {
    if (gnutls_rnd(GNUTLS_RND_KEY, _secret.data(), _secret.size()) != 0) {
        throw std::runtime_error("the system has no random numbers");
    }
}

bool SeenRequests::add(std::string_view body) {
    Digest digest{};
    gnutls_hmac_fast(GNUTLS_MAC_SHA256, _secret.data(), _secret.size(), body.data(), body.size(),
                     digest.data());
    const std::lock_guard lock(_mutex);
    const Clock::time_point now = _now();
    _forgetOld(now);
    if (!_digests.insert(digest).second) {
        return false;
    }
    _inOrder.emplace_back(now, digest);
    while (_inOrder.size() > _maximum) {
        _digests.erase(_inOrder.front().second);
        _inOrder.pop_front();
    }
    return true;
}

std::size_t SeenRequests::size() {
    const std::lock_guard lock(_mutex);
    _forgetOld(_now());
    return _inOrder.size();
}

void SeenRequests::_forgetOld(Clock::time_point now) {
    while (!_inOrder.empty() && _inOrder.front().first + kRemembered <= now) {
        _digests.erase(_inOrder.front().second);
        _inOrder.pop_front();
    }
}

} // namespace welcomer::server
