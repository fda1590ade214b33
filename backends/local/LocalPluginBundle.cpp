#include "backends/local/LocalPluginBundle.h"

#include "backends/local/FileContent.h"
#include "backends/local/SystemError.h"
#include "platform/Path.h"
#include "propertylist/PropertyListReader.h"

#include <cstdlib>
#include <dlfcn.h>
#include <memory>
#include <optional>
#include <sys/stat.h>

namespace welcomer::local {

namespace {

constexpr std::size_t kMaximumInfoSize = std::size_t{1} << 20;

bool isFolder(const std::string& path) {
    struct stat status = {};
    return ::stat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

// A path without symbolic links and dots, or none when nothing is there.
std::optional<std::string> resolved(const std::string& path) {
    const std::unique_ptr<char, void (*)(void*)> result(::realpath(path.c_str(), nullptr), ::free);
    return result ? std::optional<std::string>(result.get()) : std::nullopt;
}

// The library of a folder, or none with the reason.
std::optional<std::string> libraryOf(const std::string& folder, std::string& reason) {
    const std::string infoPath = platform::joinPath(folder, "Info.plist");
    std::string bytes;
    if (const int error = readFile(infoPath, bytes, kMaximumInfoSize)) {
        reason = systemError("cannot read " + infoPath, error).message;
        return std::nullopt;
    }
    const PropertyListReadResult info = readPropertyList(bytes);
    if (!info) {
        reason = infoPath + ": " + info.error;
        return std::nullopt;
    }
    const PropertyList* executable = info.value->find("Executable");
    const std::string* name = executable ? executable->string() : nullptr;
    if (!name || name->empty()) {
        reason = infoPath + ": no Executable";
        return std::nullopt;
    }
    std::optional<std::string> library = resolved(platform::joinPath(folder, *name));
    const std::optional<std::string> inside = resolved(folder);
    if (!library || !inside) {
        reason = folder + ": its Executable is missing";
        return std::nullopt;
    }
    if (!library->starts_with(platform::joinPath(*inside, ""))) {
        reason = folder + ": its Executable is outside of it";
        return std::nullopt;
    }
    return library;
}

std::string lastLoaderError(const std::string& path) {
    const char* error = ::dlerror();
    return error ? error : path + " cannot be loaded";
}

} // namespace

platform::PluginSymbol LocalPluginBundle::load(const std::string& path, const char* symbol) {
    const std::string located = _root.locate(path);
    // A library is loaded without a look at what it is: scanning many plug-ins should cost what loading
    // costs.
    void* library = ::dlopen(located.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (!library) {
        std::string reason = lastLoaderError(located);
        if (!isFolder(located)) {
            return {nullptr, reason};
        }
        const std::optional<std::string> inner = libraryOf(located, reason);
        if (!inner) {
            return {nullptr, reason};
        }
        library = ::dlopen(inner->c_str(), RTLD_NOW | RTLD_LOCAL);
        if (!library) {
            return {nullptr, lastLoaderError(*inner)};
        }
    }
    const void* address = ::dlsym(library, symbol);
    if (!address) {
        return {nullptr, located + ": no symbol " + symbol};
    }
    return {address, {}};
}

} // namespace welcomer::local
