#include "tools/welcomer/ToolBundle.h"

#include <filesystem>
#include <system_error>

namespace welcomer::tool {

namespace fs = std::filesystem;

std::string findToolBundle() {
    std::error_code error;
    const fs::path programs = fs::read_symlink("/proc/self/exe", error).parent_path();
    for (const fs::path& folder : {programs / WELCOMER_DATA_FROM_PROGRAMS, programs.parent_path()}) {
        fs::path bundle = folder / "tool-bundle";
        if (fs::is_directory(bundle, error)) {
            return bundle.string();
        }
    }
    return {};
}

} // namespace welcomer::tool
