#include "tools/welcomer/cli/ToolBundle.h"

#include <filesystem>
#include <system_error>

namespace welcomer::tool {

namespace fs = std::filesystem;

namespace {

std::string findBundle(const char* name) {
    std::error_code error;
    for (const ToolFolders& folders : toolFolders()) {
        const fs::path bundle = (folders.data / name).lexically_normal();
        if (fs::is_directory(bundle, error)) {
            return bundle.string();
        }
    }
    return {};
}

} // namespace

std::vector<ToolFolders> toolFolders() {
    std::error_code error;
    const fs::path programs = fs::read_symlink("/proc/self/exe", error).parent_path();
    if (error) {
        return {};
    }
    const fs::path built = programs.parent_path();
    return {{programs / WELCOMER_DATA_FROM_PROGRAMS, programs / WELCOMER_EXAMPLES_FROM_PROGRAMS,
             programs / WELCOMER_SERVICES_FROM_PROGRAMS},
            {built, built, programs}};
}

std::string findToolBundle() {
    return findBundle("tool-bundle");
}

std::string findSetupBundle() {
    return findBundle("setup-bundle");
}

} // namespace welcomer::tool
