#include "tools/welcomer/plugins/SanitizedExamination.h"

#include "tools/welcomer/checks/ChildOutput.h"
#include "tools/welcomer/plugins/LibrarySymbols.h"
#include "tools/welcomer/terminal/Failure.h"

#include <algorithm>
#include <chrono>
#include <dlfcn.h>
#include <vector>

namespace welcomer::tool {

namespace {

using namespace std::chrono_literals;

constexpr auto kLimit = 600s; // five for each check, and some more

} // namespace

std::string missingSanitizer(const std::filesystem::path& library) {
    const std::vector<std::string> needed = readLibrarySymbols(library).needed;
    const auto runtime = std::ranges::find_if(needed, [](const std::string& name) {
        return name.starts_with("libasan.so") || name.starts_with("libclang_rt.asan");
    });
    return runtime == needed.end() || ::dlsym(RTLD_DEFAULT, "__asan_init") ? "" : *runtime;
}

Json examineWithSanitizer(const std::string& runtime, const std::filesystem::path& file,
                          const std::string& response) {
    // Its own look for leaks comes when a process ends by itself, as those of the checks do not. The report is cut to a line,
    // for which nobody has to look up names for seconds.
    std::vector<std::string> command{"env",
                                     "LD_PRELOAD=" + runtime,
                                     "ASAN_OPTIONS=detect_leaks=0:symbolize=0",
                                     std::filesystem::read_symlink("/proc/self/exe").string(),
                                     "--json",
                                     "plugins",
                                     "check"};
    if (!response.empty()) {
        command.insert(command.end(), {"--response", response});
    }
    command.insert(command.end(), {"--", file.string()});
    const ChildOutput output = outputOf(command, kLimit);
    const Json document = Json::parse(output.text, nullptr, false);
    if (!output.trouble.empty() || !document.is_object()) {
        throw CommandFailure("the plug-in cannot be checked with " + runtime +
                             (output.trouble.empty() ? "" : ": " + output.trouble));
    }
    return document["plugins"].at(0)["checks"];
}

} // namespace welcomer::tool
