#include "backends/desktop/DesktopModule.h"

#include "backends/posix/Directory.h"
#include "backends/posix/FileDescriptor.h"
#include "generated/WelcomerConfiguration.h"
#include "platform/Path.h"

#include <cstring>
#include <dlfcn.h>
#include <fcntl.h>
#include <unistd.h>
#include <vector>

namespace welcomer::desktop {

namespace {

constexpr std::string_view kVersion = configuration::kVersion;

// Where each version's modules have a folder: beside the library, and, for a program of the build tree that holds
// all of it, beside that program's folder.
std::vector<std::string> folderParents() {
    Dl_info info = {};
    if (::dladdr(reinterpret_cast<const void*>(&loadModule), &info) == 0 || !info.dli_fname) {
        return {};
    }
    const std::string path = info.dli_fname;
    const std::string here = path.substr(0, path.rfind('/') + 1);
    return {here + "welcomer", here + "../lib/welcomer"};
}

std::string fileIn(const std::string& folder, const std::string& name) {
    return platform::joinPath(folder, name + ".so");
}

bool isThere(const std::string& path) {
    return ::access(path.c_str(), F_OK) == 0;
}

// Empty where it is not installed.
std::string pathOf(const std::string& name, const std::string& folder) {
    std::vector<std::string> candidates;
    if (!folder.empty()) {
        candidates.push_back(fileIn(folder, name));
    } else {
        for (const std::string& parent : folderParents()) {
            candidates.push_back(fileIn(platform::joinPath(parent, std::string(kVersion)), name));
        }
    }
    for (std::string& path : candidates) {
        if (isThere(path)) {
            return std::move(path);
        }
    }
    return "";
}

// Another version whose module is there in the place of this one's, or none.
std::string otherVersionOf(const std::string& name) {
    for (const std::string& parent : folderParents()) {
        const auto versions = posix::listDirectory(
            posix::FileDescriptor(::open(parent.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)));
        for (const std::string& version : versions.value_or(std::vector<std::string>())) {
            if (isThere(fileIn(platform::joinPath(parent, version), name))) {
                return version;
            }
        }
    }
    return "";
}

// What there is to say of a module that was not found.
ModuleOutcome missing(const std::string& name, const std::string& folder) {
    const std::string other = folder.empty() ? otherVersionOf(name) : "";
    if (other.empty()) {
        return {.whyNot = "the module " + name + ".so is not installed", .isMissing = true};
    }
    return {.whyNot = "the module " + name + ".so of version " + std::string(kVersion) +
                      " is not installed, but that of version " + other};
}

const char* loadingError() {
    const char* const error = ::dlerror();
    return error ? error : "unknown error";
}

} // namespace

bool isModuleInstalled(const std::string& name, const std::string& folder) {
    return !pathOf(name, folder).empty();
}

ModuleOutcome loadModule(const std::string& name, const std::string& folder) {
    const std::string path = pathOf(name, folder);
    if (path.empty()) {
        return missing(name, folder);
    }
    // Never closed: libraries of the desktop leave threads and types behind that cannot be unloaded.
    void* const library = ::dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL | RTLD_NODELETE);
    if (!library) {
        return {.whyNot = "the module cannot be loaded: " + std::string(loadingError())};
    }
    const void* const entry = ::dlsym(library, kModuleEntrySymbol);
    if (!entry) {
        return {.whyNot = path + " is no module: " + loadingError()};
    }
    const char* const build = *static_cast<const char* const*>(entry); // its first member
    if (std::strcmp(build, WELCOMER_MODULE_BUILD) != 0) {
        return {.whyNot = path + " is of another build: " + build};
    }
    return {.entry = entry};
}

void reportFallback(const Modules& modules, const std::string& name, const std::string& whyNot) {
    if (modules.systemLog) {
        modules.systemLog->write(platform::kErrorPriority,
                                 "The desktop's " + name + " is not used, but what is local: " + whyNot);
    }
}

} // namespace welcomer::desktop
