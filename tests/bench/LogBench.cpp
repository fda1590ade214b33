// One log call against a bare syslog(3) call with the same text.

#include "backends/Backends.h"
#include "log/PCLogManager.h"
#include "tests/bench/TurnAbout.h"

#include <benchmark/benchmark.h>
#include <string>
#include <syslog.h>

namespace welcomer {
namespace {

const std::string identifier = "com.corvid.storefront";
constexpr double kSeconds = 0.125;

void logCall(benchmark::State& state) {
    const auto owner = buildPlatform();
    const platform::ScopedPlatform installed(owner->platform());
    measureTurnAbout(
        state, [] {}, [] { WL_LOG("%@ setup: %@ (%0.3f seconds)", identifier, "completed", kSeconds); },
        [] {
            syslog((14 << 3) | LOG_ERR, "%s setup: %s (%0.3f seconds)", identifier.c_str(), "completed",
                   kSeconds);
        });
}
BENCHMARK(logCall)->UseManualTime();

} // namespace
} // namespace welcomer
