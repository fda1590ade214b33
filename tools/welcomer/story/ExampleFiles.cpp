#include "tools/welcomer/story/ExampleFiles.h"

#include "plugins/WLNimbusDelegatePlugins.h"
#include "tools/welcomer/terminal/Failure.h"

#include <algorithm>
#include <utility>

namespace welcomer::tool {

namespace fs = std::filesystem;

ExampleFiles findExampleFiles() {
    const fs::path programs = fs::read_symlink("/proc/self/exe").parent_path();
    const fs::path built = programs.parent_path();
    // The installed tree first, then the build tree.
    for (const auto& [data, examples] :
         {std::pair(programs / WELCOMER_DATA_FROM_PROGRAMS, programs / WELCOMER_EXAMPLES_FROM_PROGRAMS),
          std::pair(built, built)}) {
        ExampleFiles files{data / "setup-bundle", {}};
        const fs::path plugins = examples / "plugins";
        if (!fs::is_directory(files.setupBundle) || !fs::is_directory(plugins)) {
            continue;
        }
        for (const auto& entry : fs::directory_iterator(plugins)) {
            if (entry.path().extension() == std::string(".") + kPluginExtension) {
                files.plugins.push_back(entry.path());
            }
        }
        std::sort(files.plugins.begin(), files.plugins.end());
        if (!files.plugins.empty()) {
            return files;
        }
    }
    throw CommandFailure("the example plug-ins and the example setup application are not beside " +
                         programs.string());
}

} // namespace welcomer::tool
