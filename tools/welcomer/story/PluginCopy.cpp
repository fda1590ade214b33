#include "tools/welcomer/story/PluginCopy.h"

#include "plugins/WLNimbusDelegatePlugins.h"
#include "tools/welcomer/story/FolderCopy.h"
#include "tools/welcomer/terminal/Failure.h"

#include <string>

namespace welcomer::tool {

namespace {

namespace fs = std::filesystem;

void closeToOthers(const fs::path& path) {
    fs::permissions(path, fs::perms::group_write | fs::perms::others_write, fs::perm_options::remove);
}

} // namespace

void installPlugin(const fs::path& source, const fs::path& folder) {
    const fs::path given = source.has_filename() ? source : source.parent_path();
    const fs::path copy = folder / (given.stem().string() + "." + kPluginExtension);
    if (fs::exists(copy)) {
        throw CommandFailure("two plug-ins have the name " + copy.filename().string());
    }
    copyTree(given, copy);
    closeToOthers(copy);
    if (fs::is_directory(copy)) {
        for (const auto& each : fs::recursive_directory_iterator(copy)) {
            closeToOthers(each.path());
        }
    }
}

} // namespace welcomer::tool
