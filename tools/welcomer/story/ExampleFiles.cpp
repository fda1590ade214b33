#include "tools/welcomer/story/ExampleFiles.h"

#include "plugins/WLNimbusDelegatePlugins.h"
#include "tools/welcomer/cli/ToolBundle.h"
#include "tools/welcomer/terminal/Failure.h"

#include <algorithm>

namespace welcomer::tool {

namespace fs = std::filesystem;

ExampleFiles findExampleFiles() {
    std::string looked;
    for (const ToolFolders& folders : toolFolders()) {
        looked += (looked.empty() ? "" : " or ") + folders.data.lexically_normal().string();
        ExampleFiles files{folders.data / "setup-bundle", {}};
        const fs::path plugins = folders.examples / "plugins";
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
    throw CommandFailure("the example plug-ins and the example setup application are not in " + looked);
}

} // namespace welcomer::tool
