// Times one first look at a folder of plug-ins, and prints time and memory as JSON. A process of its own for
// each run, since a library stays loaded.
//   scan-plugins welcomer ROOT    the system's own scan of the plug-in directory below ROOT
//   scan-plugins bare ROOT        dlopen and dlsym of the same files, and nothing else

#include "backends/Backends.h"
#include "plugins/WLNimbusDelegatePlugins.h"

#include <chrono>
#include <cstdio>
#include <cstring>
#include <dlfcn.h>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

namespace {

// Of this process, in kB.
long residentMemory() {
    std::ifstream status("/proc/self/status");
    for (std::string line; std::getline(status, line);) {
        if (line.starts_with("VmRSS:")) {
            return std::stol(line.substr(6));
        }
    }
    return 0;
}

std::size_t scanBare(const std::string& root) {
    std::size_t found = 0;
    for (const auto& entry : std::filesystem::directory_iterator(root + welcomer::kPluginDirectory)) {
        void* library = dlopen(entry.path().c_str(), RTLD_NOW | RTLD_LOCAL);
        found += library && dlsym(library, "wl_delegate_plugin");
    }
    return found;
}

std::size_t scanWelcomer() {
    return welcomer::WLNimbusDelegatePlugins().size();
}

} // namespace

int main(int argc, char** argv) {
    if (argc != 3 || (std::strcmp(argv[1], "welcomer") != 0 && std::strcmp(argv[1], "bare") != 0)) {
        std::fputs("usage: scan-plugins welcomer|bare ROOT\n", stderr);
        return 2;
    }
    const bool bare = !std::strcmp(argv[1], "bare");
    welcomer::PlatformOptions options;
    options.root = argv[2];
    // Outlives the plug-ins. The run loop is there before, as in every program that waits for plug-ins.
    static const auto owner = welcomer::buildPlatform(options);
    static const welcomer::platform::ScopedPlatform installed(owner->platform());
    owner->platform().runLoops.current();
    const long before = residentMemory();
    const auto start = std::chrono::steady_clock::now();
    const std::size_t found = bare ? scanBare(argv[2]) : scanWelcomer();
    const auto end = std::chrono::steady_clock::now();
    std::printf(
        "{\"found\": %zu, \"ns\": %lld, \"kB\": %ld}\n", found,
        static_cast<long long>(std::chrono::duration_cast<std::chrono::nanoseconds>(end - start).count()),
        residentMemory() - before);
    return 0;
}
