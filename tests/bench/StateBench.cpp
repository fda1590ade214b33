// The per-user record against the plain file operations that it cannot do without. Each pair works on the
// same disk and on a file of the same size; compare the medians of one run.

#include "backends/Backends.h"
#include "propertylist/PropertyListReader.h"
#include "state/WLPerUserState.h"

#include <benchmark/benchmark.h>

#include <array>
#include <chrono>
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

namespace welcomer {
namespace {

class SilentLog final : public platform::SystemLog {
  public:
    void write(int, const std::string&) override {}
};

// A system of its own in a temporary folder, with a record in it.
class Fixture {
  public:
    Fixture() {
        std::string folder = std::filesystem::temp_directory_path() / "welcomer-bench-XXXXXX";
        if (!::mkdtemp(folder.data())) {
            throw std::runtime_error("cannot make " + folder);
        }
        root = folder;
        owner = buildPlatform({.root = folder, .systemLog = &log});
        const std::string home = owner->platform().processIdentity.homeDirectory();
        std::filesystem::create_directories(folder + home);
        installed.emplace(owner->platform());
        state.emplace();
        fill(1);
        if (!state->writeToDefaults()) {
            throw std::runtime_error("cannot store the record");
        }
        file = folder + home + "/Library/Preferences/com.corvid.FirstRun.plist";
    }
    ~Fixture() {
        state.reset();
        std::error_code error;
        std::filesystem::remove_all(root, error);
    }
    Fixture(const Fixture&) = delete;
    Fixture& operator=(const Fixture&) = delete;

    // Gives every property a value; the same size for every round.
    void fill(int round) {
        const std::string version = std::to_string(10 + round % 90);
        state->setPreviousSystemVersionBuildVersion(version, "build " + version);
        state->setDidSeeCloudSetup(true);
        state->setLastSeenCloudProductVersion(version);
        state->setDidSeeSyncSetup(true);
        state->setDidSeeSyncSetup2(true);
        state->setLastSeenSyncProductVersion(version);
        state->setLastPreLoginTasksPerformedBuild("build " + version);
        state->setLastPreLoginTasksPerformedVersion(version);
        state->setLastCacheCleanupProductVersion(version);
    }

    SilentLog log;
    std::unique_ptr<PlatformOwner> owner;
    std::optional<platform::ScopedPlatform> installed;
    std::optional<WLPerUserState> state;
    std::filesystem::path root;
    std::string file;
};

void writeToDefaults(benchmark::State& benchmarkState) {
    Fixture fixture;
    int round = 0;
    for ([[maybe_unused]] auto _ : benchmarkState) {
        fixture.fill(++round); // else there would be nothing to write
        if (!fixture.state->writeToDefaults()) {
            benchmarkState.SkipWithError("the record was not stored");
        }
    }
}
BENCHMARK(writeToDefaults)->UseRealTime()->Unit(benchmark::kMicrosecond);

// What stores a file of that size durably, and no more.
void writeAndSyncOneFile(benchmark::State& benchmarkState) {
    Fixture fixture;
    const std::string content(std::filesystem::file_size(fixture.file), 'x');
    const std::string path = fixture.root / "peer";
    for ([[maybe_unused]] auto _ : benchmarkState) {
        const int file = ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
        const bool written =
            ::write(file, content.data(), content.size()) == static_cast<ssize_t>(content.size()) &&
            ::fsync(file) == 0;
        if (::close(file) != 0 || !written) {
            benchmarkState.SkipWithError("the file was not written");
        }
    }
}
BENCHMARK(writeAndSyncOneFile)->UseRealTime()->Unit(benchmark::kMicrosecond);

// Reads the record's file as a program does that knows of no store.
PropertyListReadResult readPlainly(const std::string& path) {
    const int file = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
    std::string bytes;
    std::array<char, 4096> block;
    ssize_t count = 0;
    while ((count = ::read(file, block.data(), block.size())) > 0) {
        bytes.append(block.data(), static_cast<std::size_t>(count));
    }
    ::close(file);
    return readPropertyList(bytes);
}

// Loading again what nobody has changed: the store reads the file, and parses it only when it differs.
void loadRecord(benchmark::State& benchmarkState) {
    Fixture fixture;
    for ([[maybe_unused]] auto _ : benchmarkState) {
        fixture.state->_loadFromDefaults();
    }
    if (!fixture.state->didSeeSyncSetup2()) {
        benchmarkState.SkipWithError("the record was not loaded");
    }
}
BENCHMARK(loadRecord)->UseRealTime()->Unit(benchmark::kMicrosecond);

void readFileAndPropertyList(benchmark::State& benchmarkState) {
    Fixture fixture;
    for ([[maybe_unused]] auto _ : benchmarkState) {
        const PropertyListReadResult result = readPlainly(fixture.file);
        if (!result) {
            benchmarkState.SkipWithError("the file was not read");
        }
        benchmark::DoNotOptimize(result);
    }
}
BENCHMARK(readFileAndPropertyList)->UseRealTime()->Unit(benchmark::kMicrosecond);

// Times an action alone, after another process has changed the file before each round.
template <class Action>
void measureAfterChanges(benchmark::State& benchmarkState, const Action& action) {
    Fixture fixture;
    std::array<std::string, 2> contents;
    for (std::size_t index = 0; index < contents.size(); ++index) {
        fixture.fill(static_cast<int>(index));
        fixture.state->writeToDefaults();
        std::ifstream file(fixture.file);
        contents[index].assign(std::istreambuf_iterator<char>(file), {});
    }
    std::size_t round = 0;
    for ([[maybe_unused]] auto _ : benchmarkState) {
        std::ofstream(fixture.file) << contents[++round % 2];
        const auto start = std::chrono::steady_clock::now();
        action(fixture);
        benchmarkState.SetIterationTime(
            std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count());
    }
}

void loadChangedRecord(benchmark::State& benchmarkState) {
    measureAfterChanges(benchmarkState, [](Fixture& fixture) { fixture.state->_loadFromDefaults(); });
}
BENCHMARK(loadChangedRecord)->UseManualTime()->Unit(benchmark::kMicrosecond);

void readChangedFileAndPropertyList(benchmark::State& benchmarkState) {
    measureAfterChanges(benchmarkState,
                        [](Fixture& fixture) { benchmark::DoNotOptimize(readPlainly(fixture.file)); });
}
BENCHMARK(readChangedFileAndPropertyList)->UseManualTime()->Unit(benchmark::kMicrosecond);

} // namespace
} // namespace welcomer

BENCHMARK_MAIN();
