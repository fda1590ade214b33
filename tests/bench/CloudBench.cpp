// The cloud services: enabling after login against bare writes of the same file, building the request from
// many plug-ins, and a sign-in that is answered at once.

#include "backends/Backends.h"
#include "backends/local/accounts/NimbusDirectory.h"
#include "backends/local/accounts/PasswordHash.h"
#include "backends/local/time/LocalRunLoops.h"
#include "backends/simulated/VirtualTime.h"
#include "cloud/NimbusTesselDelegate.h"
#include "cloud/WLNimbusServiceCatalogue.h"
#include "cloud/WLNimbusSetupWithDictionary.h"
#include "plugins/WLFirstRunDelegateConfiguration.h"
#include "plugins/WLNimbusDelegatesRequest.h"
#include "propertylist/PropertyListWriter.h"
#include "tests/fakes/PluginRegistry.h"

#include <benchmark/benchmark.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <unistd.h>
#include <utility>
#include <vector>

namespace welcomer {
namespace {

using namespace std::chrono_literals;
using Dictionary = PropertyList::Dictionary;

constexpr char kUser[] = "newcomer@nimbus.example";
constexpr char kPassword[] = "open sesame";
// The password's hash at the lowest cost there is, so that the answer comes at once.
constexpr char kQuickHash[] = "$y$j75$V9paoSVPeGZmV/WJwhY7K.$MeCjEV9CouSmYsS9lrPmTkBX/aO8pTqeLTD/U94Wz.1";
constexpr auto kSlice = 100ms; // of the run loop, in which a sign-in is waited for

class SilentLog final : public platform::SystemLog {
  public:
    void write(int, const std::string&) override {}
};

// A system of its own in a temporary folder, whose directory knows one user.
class Fixture {
  public:
    explicit Fixture(PlatformOptions options = {}, const std::string& passwordHash = kQuickHash) {
        std::string folder = std::filesystem::temp_directory_path() / "welcomer-bench-XXXXXX";
        if (!::mkdtemp(folder.data())) {
            throw std::runtime_error("cannot make " + folder);
        }
        root = folder;
        options.root = folder;
        options.systemLog = &log;
        owner = buildPlatform(options);
        const std::string home = owner->platform().processIdentity.homeDirectory();
        std::filesystem::create_directories(folder + home);
        const std::filesystem::path directory = folder + local::kNimbusDirectoryPath;
        std::filesystem::create_directories(directory.parent_path());
        const Dictionary user = {{"Password", passwordHash}, {"MailAddress", kUser}};
        const Dictionary users = {{kUser, user}};
        std::ofstream(directory) << *writeXMLPropertyList(Dictionary{{"Users", users}});
        installed.emplace(owner->platform());
        accountFile = folder + home + "/Library/Accounts/Accounts.plist";
    }
    ~Fixture() {
        std::error_code error;
        std::filesystem::remove_all(root, error);
    }
    Fixture(const Fixture&) = delete;
    Fixture& operator=(const Fixture&) = delete;

    SilentLog log;
    std::unique_ptr<PlatformOwner> owner;
    std::optional<platform::ScopedPlatform> installed;
    std::filesystem::path root;
    std::string accountFile;
};

std::string readFile(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

double seconds(std::chrono::steady_clock::duration duration) {
    return std::chrono::duration<double>(duration).count();
}

double median(std::vector<double> values) {
    std::ranges::sort(values);
    return values.empty() ? 0 : values[values.size() / 2];
}

double microseconds(std::chrono::steady_clock::duration duration) {
    return seconds(duration) * 1e6;
}

// Times a subject and its peer turn about, so that what else the machine does slows both, and gives the
// medians in microseconds.
template <typename Subject, typename Peer>
void compare(benchmark::State& benchmarkState, const Subject& subject, const Peer& peer) {
    std::vector<double> ours;
    std::vector<double> theirs;
    bool peerFirst = false;
    for ([[maybe_unused]] auto _ : benchmarkState) {
        if (peerFirst) {
            theirs.push_back(microseconds(peer()));
        }
        ours.push_back(microseconds(subject()));
        if (!peerFirst) {
            theirs.push_back(microseconds(peer()));
        }
        peerFirst = !peerFirst;
    }
    benchmarkState.counters["ours_us"] = median(ours);
    benchmarkState.counters["peer_us"] = median(theirs);
}

// The post-login phase of an account whose services are off, its delayed services included; and what stores a
// file of that size durably ten times, and no more.
void postLoginStageAndTenBareWrites(benchmark::State& benchmarkState) {
    simulated::VirtualTime time;
    Fixture fixture({.clock = &time, .runLoops = &time, .dispatchQueues = &time});
    const auto account =
        platform::current().accountService.sharedManager().accountForID(PropertyList(kUser), true);
    const std::string before = readFile(fixture.accountFile);
    const auto port = time.current()->attachPort();
    const auto stage = [&] {
        std::ofstream(fixture.accountFile, std::ios::binary) << before;
        const auto start = std::chrono::steady_clock::now();
        WLNimbusSetupWithDictionary2({{platform::kSKPropertyAccountID, kUser}}, WLNimbusAllSetupServiceIDs(),
                                     false, true, nullptr, nullptr);
        time.current()->run(3s);
        const auto duration = std::chrono::steady_clock::now() - start;
        for (const std::string& identifier : WLNimbusPostLoginServiceIDs()) {
            if (!platform::current().accountService.isServiceEnabled(account.get(), identifier)) {
                benchmarkState.SkipWithError("a service was not enabled");
            }
        }
        return duration;
    };
    const auto bareWrites = [&] {
        const std::string content = readFile(fixture.accountFile);
        const auto start = std::chrono::steady_clock::now();
        for (int round = 0; round < 10; ++round) {
            const int file = ::open(fixture.accountFile.c_str(), O_WRONLY | O_TRUNC | O_CLOEXEC);
            const bool written =
                ::write(file, content.data(), content.size()) == static_cast<ssize_t>(content.size()) &&
                ::fsync(file) == 0;
            if (::close(file) != 0 || !written) {
                benchmarkState.SkipWithError("the file was not written");
            }
        }
        return std::chrono::steady_clock::now() - start;
    };
    compare(benchmarkState, stage, bareWrites);
}
BENCHMARK(postLoginStageAndTenBareWrites)->Iterations(100)->Unit(benchmark::kMicrosecond);

class RequestingDelegate final : public WLFirstRunDelegateConfiguration {
  public:
    explicit RequestingDelegate(std::string identifier) : _identifier(std::move(identifier)) {}
    std::optional<std::string> delegateIdentifier() override { return _identifier; }
    std::optional<PropertyList> delegateSetupRequest() override { return Dictionary{{"version", 1}}; }
    void completeSetupWithResponseHandler(const PropertyList& /*response*/,
                                          CompletionHandler /*handler*/) override {}
    void
    completeSetupWithResponseChosenAliasesHandler(const PropertyList& /*response*/,
                                                  const std::optional<std::vector<std::string>>& /*aliases*/,
                                                  CompletionHandler /*handler*/) override {}
    std::optional<std::vector<std::string>>
    messagingAliasesFromResponse(const PropertyList& /*response*/) override {
        return std::nullopt;
    }
    std::string className() const override { return "RequestingDelegate"; }

  private:
    std::string _identifier;
};

void buildRequest(benchmark::State& benchmarkState) {
    const Fixture fixture({}, kQuickHash);
    DelegatePluginArray plugins;
    for (std::int64_t number = 0; number < benchmarkState.range(0); ++number) {
        plugins.push_back(
            std::make_shared<RequestingDelegate>("com.corvid.bench.number" + std::to_string(number)));
    }
    fakes::fillPluginRegistry(std::move(plugins));
    for ([[maybe_unused]] auto _ : benchmarkState) {
        benchmark::DoNotOptimize(WLNimbusDelegatesRequest({}, {}));
    }
    fakes::fillPluginRegistry({});
}
BENCHMARK(buildRequest)->Arg(1)->Arg(10)->Arg(100)->Arg(1000)->Unit(benchmark::kMicrosecond);

// The machine's own loops, counting the slices that are asked of them.
class CountingRunLoops final : public platform::RunLoops {
  public:
    class Loop final : public platform::RunLoop {
      public:
        Loop(std::shared_ptr<platform::RunLoop> loop, int& slices)
            : _loop(std::move(loop)),
              _slices(slices) {}
        void run(std::chrono::nanoseconds duration) override {
            ++_slices;
            _loop->run(duration);
        }
        void perform(std::function<void()> block) override { _loop->perform(std::move(block)); }
        std::unique_ptr<platform::RunLoopPort> attachPort() override { return _loop->attachPort(); }

      private:
        const std::shared_ptr<platform::RunLoop> _loop;
        int& _slices;
    };

    std::shared_ptr<platform::RunLoop> current() override {
        return std::make_shared<Loop>(_loops.current(), slices);
    }

    int slices = 0;

  private:
    local::LocalRunLoops _loops;
};

// Signs in.
//  loops  count the slices that it turns
std::chrono::steady_clock::duration signIn(benchmark::State& benchmarkState, CountingRunLoops& loops) {
    loops.slices = 0;
    NimbusTesselDelegate delegate;
    const auto start = std::chrono::steady_clock::now();
    if (!delegate.signInWithUsernameAndPasswordAdditionalDelegatesOmittingDelegatesError(kUser, kPassword, {},
                                                                                         {}, nullptr)) {
        benchmarkState.SkipWithError("the sign-in failed");
    }
    return std::chrono::steady_clock::now() - start;
}

// With the most slices that any of the sign-ins turned.
void signInAnsweredAtOnce(benchmark::State& benchmarkState) {
    CountingRunLoops loops;
    Fixture fixture({.runLoops = &loops}, kQuickHash);
    int most = 0;
    for ([[maybe_unused]] auto _ : benchmarkState) {
        signIn(benchmarkState, loops);
        most = std::max(most, loops.slices);
    }
    benchmarkState.counters["slices"] = most;
}
BENCHMARK(signInAnsweredAtOnce)->UseRealTime()->Unit(benchmark::kMicrosecond);

// With the password's hash as the tool makes it, which takes its time on purpose, beside that hash alone; and
// with the most slices that any sign-in turned after the one in which it ended.
void signInAndItsHash(benchmark::State& benchmarkState) {
    CountingRunLoops loops;
    const std::string hash = local::makePasswordHash(kPassword).value();
    Fixture fixture({.runLoops = &loops}, hash);
    int most = 0;
    compare(
        benchmarkState,
        [&] {
            const auto duration = signIn(benchmarkState, loops);
            most = std::max(most, loops.slices - static_cast<int>(duration / kSlice) - 1);
            return duration;
        },
        [&] {
            const auto start = std::chrono::steady_clock::now();
            if (!local::passwordMatches(kPassword, hash)) {
                benchmarkState.SkipWithError("the password is wrong");
            }
            return std::chrono::steady_clock::now() - start;
        });
    benchmarkState.counters["slices_too_many"] = most;
}
BENCHMARK(signInAndItsHash)->Iterations(100)->Unit(benchmark::kMicrosecond);

} // namespace
} // namespace welcomer

BENCHMARK_MAIN();
