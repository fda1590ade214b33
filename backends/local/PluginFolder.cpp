#include "backends/local/PluginFolder.h"

#include "platform/PluginDirectory.h"

#include <string_view>
#include <utility>

namespace welcomer::local {

PluginFolder::PluginFolder(posix::RootFolder root, std::string packages)
    : _root(std::move(root)),
      _packages(std::move(packages)) {}

std::string PluginFolder::defaultFolder() {
    return WELCOMER_PLUGIN_FOLDER;
}

std::string PluginFolder::serving() const {
    return _root.exists(platform::kPluginDirectory) ? platform::kPluginDirectory : _packages;
}

std::string PluginFolder::located(const std::string& path) const {
    constexpr std::string_view kGiven = platform::kPluginDirectory;
    const bool isInside =
        path.starts_with(kGiven) && (path.size() == kGiven.size() || path[kGiven.size()] == '/');
    return isInside ? serving() + path.substr(kGiven.size()) : path;
}

} // namespace welcomer::local
