#include "tools/welcomer/checks/CodeFolders.h"

#include "backends/posix/Strangers.h"

#include <fstream>
#include <set>
#include <sstream>

namespace welcomer::tool {

std::vector<std::string> loadedFiles() {
    std::ifstream maps("/proc/self/maps");
    std::set<std::string> files;
    for (std::string line; std::getline(maps, line);) {
        std::istringstream words(line);
        std::string range, rights, offset, device, node, path;
        words >> range >> rights >> offset >> device >> node >> std::ws;
        std::getline(words, path);
        if (rights.find('x') != std::string::npos && path.starts_with('/')) {
            files.insert(path);
        }
    }
    return {files.begin(), files.end()};
}

Finding checkLoadedCode() {
    const posix::RootFolder machine("/");
    const std::vector<std::string> files = loadedFiles();
    for (const std::string& file : files) {
        const std::string stranger = posix::strangerWhoMayChange(machine, file, true);
        if (!stranger.empty()) {
            std::string text = "code is loaded from ";
            text.append(file).append(", and ").append(stranger);
            return {"programs", Verdict::Wrong, text, "install the packages anew, or give it back to root"};
        }
    }
    return {"programs", Verdict::Right,
            "only root may change the " + std::to_string(files.size()) + " files that code is loaded from"};
}

} // namespace welcomer::tool
