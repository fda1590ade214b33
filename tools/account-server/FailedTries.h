// How often somebody has failed to sign in of late.

#pragma once

#include <array>
#include <chrono>
#include <cstddef>
#include <functional>
#include <list>
#include <mutex>
#include <string>
#include <string_view>
#include <unordered_map>

namespace welcomer::server {

// So many tries of one account from one address may fail within a minute; further ones are not looked at.
inline constexpr std::size_t kFailuresPerMinute = 5;

// Counts failed tries by account and address. Only so many pairs are remembered: the one that failed longest
// ago is forgotten for a new one. Any thread.
class FailedTries {
  public:
    using Clock = std::chrono::steady_clock;

    //  maximumPairs  how many pairs are remembered
    //  now           what time it is; the clock's own where a test brings none
    explicit FailedTries(std::size_t maximumPairs = std::size_t{64} * 1024,
                         std::function<Clock::time_point()> now = &Clock::now);

    // How long the pair has to wait for its next try; nothing where it may be made now.
    std::chrono::seconds wait(std::string_view account, std::string_view address);

    // Counts a try that has failed, unless the pair has to wait already.
    //  result  how long it has had to wait; then nobody is to learn of this try
    std::chrono::seconds add(std::string_view account, std::string_view address);

    // How many pairs are remembered.
    std::size_t size();

  private:
    struct Pair {
        std::size_t key;
        std::array<Clock::time_point, kFailuresPerMinute> failures; // the oldest one is written over
        std::size_t count = 0;                                      // of all failures so far
    };

    std::chrono::seconds _wait(std::size_t key, Clock::time_point now) const;
    std::size_t _key(std::string_view account, std::string_view address) const;
    void _forgetOld(Clock::time_point now);

    const std::size_t _maximumPairs;
    const std::function<Clock::time_point()> _now;
    const std::string _secret; // nobody outside can tell which pairs share a key
    std::mutex _mutex;
    std::list<Pair> _pairs; // in the order of their last failures
    std::unordered_map<std::size_t, std::list<Pair>::iterator> _byKey;
};

} // namespace welcomer::server
