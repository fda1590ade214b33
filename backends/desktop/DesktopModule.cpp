#include "backends/desktop/DesktopModule.h"

#include <array>
#include <climits>
#include <cstring>
#include <dlfcn.h>
#include <unistd.h>
#include <vector>

namespace welcomer::desktop {

namespace {

// The folder of the running program, or none.
std::string programFolder() {
    std::array<char, PATH_MAX> path{};
    const ssize_t length = ::readlink("/proc/self/exe", path.data(), path.size());
    if (length <= 0) {
        return "";
    }
    const std::string program(path.data(), static_cast<std::size_t>(length));
    return program.substr(0, program.rfind('/'));
}

std::vector<std::string> moduleFolders() {
    std::vector<std::string> folders;
    if (const std::string program = programFolder(); !program.empty()) {
        folders = {program + "/../lib/welcomer", program + "/" WELCOMER_MODULES_FROM_PROGRAMS};
    }
    folders.emplace_back(WELCOMER_MODULES_INSTALLED);
    return folders;
}

std::string pathOf(const std::string& name, const std::string& folder) {
    for (const std::string& candidate : folder.empty() ? moduleFolders() : std::vector{folder}) {
        std::string path = candidate;
        path.append("/").append(name).append(".so");
        if (::access(path.c_str(), F_OK) == 0) {
            return path;
        }
    }
    return "";
}

const char* loadingError() {
    const char* const error = ::dlerror();
    return error ? error : "unknown error";
}

} // namespace

bool isModuleInstalled(const std::string& name, const std::string& folder) {
    return !pathOf(name, folder).empty();
}

const void* loadModule(const std::string& name, const std::string& folder, std::string& whyNot) {
    const std::string path = pathOf(name, folder);
    if (path.empty()) {
        whyNot = "the module " + name + ".so is not installed";
        return nullptr;
    }
    // Never closed: libraries of the desktop leave threads and types behind that cannot be unloaded.
    void* const library = ::dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL | RTLD_NODELETE);
    if (!library) {
        whyNot = "the module cannot be loaded: " + std::string(loadingError());
        return nullptr;
    }
    const void* const entry = ::dlsym(library, kModuleEntrySymbol);
    if (!entry) {
        whyNot = path + " is no module: " + loadingError();
        return nullptr;
    }
    const char* const build = *static_cast<const char* const*>(entry); // its first member
    if (std::strcmp(build, WELCOMER_MODULE_BUILD) != 0) {
        whyNot = path + " is of another build: " + build;
        return nullptr;
    }
    return entry;
}

} // namespace welcomer::desktop
