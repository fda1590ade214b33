// Measuring an action against its peer under Google Benchmark.

#pragma once

#include <benchmark/benchmark.h>

#include <chrono>

namespace welcomer {

// Times an action turn about with its peer, so that a machine that changes its speed does so for both: the
// benchmark's time is the action's, the counter "peer_ns" the peer's in nanoseconds. The benchmark has to use
// manual time.
//  before  called before each of the two, and not timed
template <class Before, class Action, class Peer>
void measureTurnAbout(benchmark::State& benchmarkState, const Before& before, const Action& action,
                      const Peer& peer) {
    using Clock = std::chrono::steady_clock;
    const auto timeOf = [&before](const auto& measured) {
        before();
        const auto start = Clock::now();
        measured();
        return Clock::now() - start;
    };
    Clock::duration peerTime{};
    for ([[maybe_unused]] auto _ : benchmarkState) {
        benchmarkState.SetIterationTime(std::chrono::duration<double>(timeOf(action)).count());
        peerTime += timeOf(peer);
    }
    const auto nanoseconds = std::chrono::duration<double, std::nano>(peerTime).count();
    benchmarkState.counters["peer_ns"] = benchmark::Counter(nanoseconds, benchmark::Counter::kAvgIterations);
}

} // namespace welcomer
