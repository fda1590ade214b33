#include "backends/local/PluginFolder.h"

#include "generated/WelcomerConfiguration.h"
#include "platform/PluginDirectory.h"

#include <string_view>
#include <utility>

namespace welcomer::local {

PluginFolder::PluginFolder(posix::RootFolder root, Packages packages)
    : _root(std::move(root)),
      _packages(std::move(packages)) {}

std::string PluginFolder::builtIn() {
    return std::string(configuration::kPluginFolder);
}

std::string PluginFolder::serving() const {
    return _root.exists(platform::kPluginDirectory) ? platform::kPluginDirectory : _packages();
}

std::string PluginFolder::located(const std::string& path) const {
    constexpr std::string_view kGiven = platform::kPluginDirectory;
    const bool isInside =
        path.starts_with(kGiven) && (path.size() == kGiven.size() || path[kGiven.size()] == '/');
    return isInside ? serving() + path.substr(kGiven.size()) : path;
}

} // namespace welcomer::local
