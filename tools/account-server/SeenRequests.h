// Which requests have been counted already, so that one that is sent twice counts once.

#pragma once

#include <array>
#include <chrono>
#include <cstddef>
#include <deque>
#include <functional>
#include <mutex>
#include <set>
#include <string_view>
#include <utility>

namespace welcomer::server {

// Remembers requests for a while by a digest that only this process can make: no password can be guessed from
// it. Only so many are remembered, the newest ones. Any thread.
class SeenRequests {
  public:
    using Clock = std::chrono::steady_clock;
    static constexpr std::chrono::minutes kRemembered{2};

    // Throws std::runtime_error when the system has no random numbers.
    //  maximum  how many are remembered
    //  now      what time it is; the clock's own where a test brings none
    explicit SeenRequests(std::size_t maximum = std::size_t{64} * 1024,
                          std::function<Clock::time_point()> now = &Clock::now);

    // Remembers a request by its whole body, in which its ID is.
    //  result  whether it is new
    bool add(std::string_view body);

    // How many are remembered.
    std::size_t size();

  private:
    static constexpr std::size_t kDigestSize = 32;
    using Digest = std::array<unsigned char, kDigestSize>;

    void _forgetOld(Clock::time_point now);

    const std::size_t _maximum;
    const std::function<Clock::time_point()> _now;
    Digest _secret;
    std::mutex _mutex;
    std::set<Digest> _digests;
    std::deque<std::pair<Clock::time_point, Digest>> _inOrder;
};

} // namespace welcomer::server
