#include "tools/welcomer/cli/ToolBundle.h"

#include <filesystem>
#include <system_error>

namespace welcomer::tool {

namespace fs = std::filesystem;

namespace {

std::string findBundle(const char* name) {
    std::error_code error;
    const fs::path programs = fs::read_symlink("/proc/self/exe", error).parent_path();
    for (const fs::path& folder : {programs / WELCOMER_DATA_FROM_PROGRAMS, programs.parent_path()}) {
        const fs::path bundle = (folder / name).lexically_normal();
        if (fs::is_directory(bundle, error)) {
            return bundle.string();
        }
    }
    return {};
}

} // namespace

std::string findToolBundle() {
    return findBundle("tool-bundle");
}

std::string findSetupBundle() {
    return findBundle("setup-bundle");
}

} // namespace welcomer::tool
