// Completing jobs that return at once, each on a serial queue of its own, against a thread for each.

#include "backends/local/time/LocalDispatchQueues.h"

#include <benchmark/benchmark.h>

#include <chrono>
#include <functional>
#include <memory>
#include <string>
#include <thread>

namespace {

using welcomer::local::LocalDispatchQueues;

// What a job of the agent holds: its group and its queue.
void completeOnQueues(benchmark::State& state) {
    LocalDispatchQueues queues;
    for (auto _ : state) {
        const auto group = queues.createGroup();
        for (std::int64_t job = 0; job < state.range(0); ++job) {
            const auto queue = queues.createSerial("job " + std::to_string(job));
            group->enter();
            queue->async([group, queue] { group->leave(); });
        }
        if (!group->wait(std::chrono::minutes(1)))
            state.SkipWithError("the jobs were not completed");
    }
}

void completeOnThreads(benchmark::State& state) {
    for (auto _ : state) {
        int completed = 0;
        for (std::int64_t job = 0; job < state.range(0); ++job)
            std::thread([&completed] { ++completed; }).join();
        if (completed != state.range(0))
            state.SkipWithError("the jobs were not completed");
    }
}

BENCHMARK(completeOnQueues)->Name("dispatch/queues")->Arg(1)->Arg(10)->Arg(100)->Arg(1000)->UseRealTime();
BENCHMARK(completeOnThreads)->Name("dispatch/threads")->Arg(1)->Arg(10)->Arg(100)->Arg(1000)->UseRealTime();

} // namespace

BENCHMARK_MAIN();
