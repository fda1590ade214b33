// What the server has done so far, as figures.

#pragma once

#include <array>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <map>
#include <mutex>
#include <string>
#include <utility>

namespace welcomer::server {

// Any thread.
class Metrics {
  public:
    // Counts an answer.
    //  resource  one of the server's own, "other" for what is none
    void countAnswer(const std::string& resource, unsigned status);

    // Counts a question to the source of users, and how long it took to answer.
    void countQuestion(std::chrono::duration<double> took);

    std::atomic<std::int64_t> connections = 0; // open now
    std::atomic<std::int64_t> underWay = 0;    // requests that wait for a thread or have one
    std::atomic<std::uint64_t> brokenOff = 0;  // connections that took too long or sent too much
    std::atomic<std::uint64_t> signIns = 0;    // a request that came twice counts once
    std::atomic<std::uint64_t> unavailable =
        0; // requests that the source could not answer, or nobody had time for
    std::atomic<std::uint64_t> reloads = 0;

    // All of it in the text form that Prometheus reads.
    std::string text() const;

  private:
    // Upper bounds of the times that questions take, in seconds.
    static constexpr std::array<double, 8> kBounds = {0.005, 0.02, 0.05, 0.1, 0.25, 1, 5, 30};

    mutable std::mutex _mutex;
    std::map<std::pair<std::string, unsigned>, std::uint64_t> _answers;
    std::array<std::uint64_t, kBounds.size() + 1> _questions = {}; // by bound, the rest last
    double _questionSeconds = 0;
};

} // namespace welcomer::server
