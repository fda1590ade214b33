// The agent's second stage with delegates that return at once, against one thread created and joined per
// delegate.

#include "agent/wlnimbussetup_RemainingDelegateSetup.h"
#include "backends/Backends.h"
#include "platform/Platform.h"
#include "tests/fakes/PluginRegistry.h"

#include <benchmark/benchmark.h>
#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <thread>
#include <utility>

namespace welcomer {
namespace {

class ReturningDelegate final : public WLFirstRunDelegateConfiguration {
  public:
    explicit ReturningDelegate(std::string identifier) : _identifier(std::move(identifier)) {}
    std::optional<std::string> delegateIdentifier() override { return _identifier; }
    std::optional<PropertyList> delegateSetupRequest() override { return std::nullopt; }
    void completeSetupWithResponseHandler(const PropertyList& /*response*/,
                                          CompletionHandler handler) override {
        handler(true, std::nullopt);
    }
    void
    completeSetupWithResponseChosenAliasesHandler(const PropertyList& /*response*/,
                                                  const std::optional<std::vector<std::string>>& /*aliases*/,
                                                  CompletionHandler handler) override {
        handler(true, std::nullopt);
    }
    std::optional<std::vector<std::string>>
    messagingAliasesFromResponse(const PropertyList& /*response*/) override {
        return std::nullopt;
    }
    std::string className() const override { return "ReturningDelegate"; }

  private:
    std::string _identifier;
};

// With everything that the stage does in the agent: its log lines, its queues, its group.
void completeDelegates(benchmark::State& state) {
    const auto owner = buildPlatform();
    const platform::ScopedPlatform installed(owner->platform());
    DelegatePluginArray plugins;
    PropertyList::Dictionary responses;
    for (std::int64_t number = 0; number < state.range(0); ++number) {
        const std::string identifier = "com.corvid.bench.number" + std::to_string(number);
        plugins.push_back(std::make_shared<ReturningDelegate>(identifier));
        responses.emplace(identifier, PropertyList::Dictionary{});
    }
    PropertyList::Dictionary response;
    response.emplace("delegates", std::move(responses));
    PropertyList::Dictionary replay;
    replay.emplace("delegatesResponseDict", std::move(response));
    const PropertyList replayObject(std::move(replay));
    fakes::fillPluginRegistry(std::move(plugins));
    for (auto _ : state) {
        const auto group = platform::current().dispatchQueues.createGroup();
        wlnimbussetup_RemainingDelegateSetup(replayObject, std::nullopt, group);
        if (!group->wait(std::chrono::minutes(1))) {
            state.SkipWithError("the delegates were not completed");
        }
    }
}

void createAndJoinThreads(benchmark::State& state) {
    for (auto _ : state) {
        std::int64_t completed = 0;
        for (std::int64_t number = 0; number < state.range(0); ++number) {
            std::thread([&completed] { ++completed; }).join();
        }
        if (completed != state.range(0)) {
            state.SkipWithError("the delegates were not completed");
        }
    }
}

BENCHMARK(completeDelegates)->Arg(1)->Arg(10)->Arg(100)->Arg(1000)->UseRealTime();
BENCHMARK(createAndJoinThreads)->Arg(1)->Arg(10)->Arg(100)->Arg(1000)->UseRealTime();

} // namespace
} // namespace welcomer
