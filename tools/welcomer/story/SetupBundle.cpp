#include "tools/welcomer/story/SetupBundle.h"

#include "platform/Platform.h"
#include "tools/welcomer/cli/ToolBundle.h"
#include "tools/welcomer/terminal/Failure.h"

#include <filesystem>

namespace welcomer::tool {

void addBundleOption(CommandLevel command, std::string& bundle) {
    command
        .option("--bundle", bundle,
                std::string("The setup application's bundle, looked up below --root [the one that comes "
                            "with the tool; below --root ") +
                    kSetupBundlePath + "]")
        .called("DIR");
}

std::unique_ptr<platform::ResourceBundle> openSetupBundle(const Options& options, const std::string& bundle) {
    const platform::Platform& platform = platform::current();
    const std::string found = bundle.empty() && !options.rootGiven ? findSetupBundle() : bundle;
    const std::string path = found.empty() ? kSetupBundlePath : found;
    if (!platform.fileSystem.exists(path)) {
        throw CommandFailure("there is no setup application at " + path +
                             (options.rootGiven ? " below " + options.root : "") + " (see --bundle)");
    }
    return platform.resourceBundles.open(path);
}

std::string systemPath(const Options& options, const char* option, const std::string& path) {
    if (path.empty() || path.starts_with('/')) {
        return path;
    }
    if (options.root != "/") {
        throw UsageError(std::string(option) + ": " + path +
                         " is looked up below --root and needs to begin with /");
    }
    return std::filesystem::absolute(path).string();
}

} // namespace welcomer::tool
