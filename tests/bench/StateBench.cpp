// The per-user record against the plain file operations that it cannot do without, on the same disk and with
// a file of the same size.

#include "backends/Backends.h"
#include "propertylist/PropertyListReader.h"
#include "state/WLPerUserState.h"
#include "tests/bench/TurnAbout.h"

#include <benchmark/benchmark.h>

#include <array>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
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

// The peer stores a file of that size durably, and no more.
void writeToDefaults(benchmark::State& benchmarkState) {
    Fixture fixture;
    const std::string content(std::filesystem::file_size(fixture.file), 'x');
    const std::string path = fixture.root / "peer";
    int round = 0;
    measureTurnAbout(
        benchmarkState, [&] { fixture.fill(++round); }, // else there would be nothing to write
        [&] {
            if (!fixture.state->writeToDefaults()) {
                benchmarkState.SkipWithError("the record was not stored");
            }
        },
        [&] {
            const int file = ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
            const bool written =
                ::write(file, content.data(), content.size()) == static_cast<ssize_t>(content.size()) &&
                ::fsync(file) == 0;
            if (::close(file) != 0 || !written) {
                benchmarkState.SkipWithError("the file was not written");
            }
        });
}
BENCHMARK(writeToDefaults)->UseManualTime()->Unit(benchmark::kMicrosecond);

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

template <class Before>
void measureLoading(benchmark::State& benchmarkState, Fixture& fixture, const Before& before) {
    measureTurnAbout(
        benchmarkState, before, [&] { fixture.state->_loadFromDefaults(); },
        [&] {
            const PropertyListReadResult result = readPlainly(fixture.file);
            benchmark::DoNotOptimize(result);
            if (!result) {
                benchmarkState.SkipWithError("the file was not read");
            }
        });
    if (!fixture.state->didSeeSyncSetup2()) {
        benchmarkState.SkipWithError("the record was not loaded");
    }
}

// Loading again what nobody has changed: the store reads the file, and parses it only when it differs.
void loadRecord(benchmark::State& benchmarkState) {
    Fixture fixture;
    measureLoading(benchmarkState, fixture, [] {});
}
BENCHMARK(loadRecord)->UseManualTime()->Unit(benchmark::kMicrosecond);

// Loading after another process has replaced the file.
void loadChangedRecord(benchmark::State& benchmarkState) {
    Fixture fixture;
    std::array<std::filesystem::path, 2> contents;
    for (std::size_t index = 0; index < contents.size(); ++index) {
        fixture.fill(static_cast<int>(index));
        fixture.state->writeToDefaults();
        contents[index] = fixture.file + std::to_string(index);
        std::filesystem::copy(fixture.file, contents[index]);
    }
    std::size_t replacements = 0;
    measureLoading(benchmarkState, fixture, [&] {
        // Every other load is the peer's; the record's own meets the other content each time.
        std::filesystem::remove(fixture.file);
        std::filesystem::create_hard_link(contents[replacements++ / 2 % 2], fixture.file);
    });
}
BENCHMARK(loadChangedRecord)->UseManualTime()->Unit(benchmark::kMicrosecond);

} // namespace
} // namespace welcomer

BENCHMARK_MAIN();
