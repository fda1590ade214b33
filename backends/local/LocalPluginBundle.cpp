#include "backends/local/LocalPluginBundle.h"

#include "backends/posix/FileContent.h"
#include "backends/posix/SystemError.h"
#include "platform/Path.h"
#include "propertylist/Lookup.h"
#include "propertylist/PropertyListReader.h"

#include <cerrno>
#include <dlfcn.h>
#include <fcntl.h>
#include <optional>
#include <sys/stat.h>

namespace welcomer::local {

namespace {

constexpr std::size_t kMaximumInfoSize = std::size_t{1} << 20;

bool isFolder(const posix::RootFolder& root, const std::string& path) {
    const posix::FileDescriptor file = root.open(path, O_PATH);
    struct stat status = {};
    return file && ::fstat(file.get(), &status) == 0 && S_ISDIR(status.st_mode);
}

// The library of a folder as a path of this machine, or none with the reason.
std::optional<std::string> libraryOf(const posix::RootFolder& root, const std::string& path,
                                     std::string& reason) {
    const std::string folder = root.shown(path);
    const std::string infoPath = platform::joinPath(folder, "Info.plist");
    std::string bytes;
    if (const int error =
            posix::readFile(root, platform::joinPath(path, "Info.plist"), bytes, kMaximumInfoSize)) {
        reason = posix::systemError("cannot read " + infoPath, error).message;
        return std::nullopt;
    }
    const PropertyListReadResult info = readPropertyList(bytes);
    if (!info) {
        reason = infoPath + ": " + info.error;
        return std::nullopt;
    }
    const std::string* const name = textIn(*info.value, "Executable");
    if (!name || name->empty()) {
        reason = infoPath + ": no Executable";
        return std::nullopt;
    }
    std::optional<std::string> library = root.resolve(platform::joinPath(path, *name));
    const std::optional<std::string> inside = root.resolve(path);
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

platform::PluginSymbol LocalPluginBundle::load(const std::string& given, const char* symbol) {
    const std::string path = _pluginFolder.located(given);
    const std::string shown = _root.shown(path);
    // The loader knows libraries by their paths, so that a descriptor's in /proc, whose number is used again,
    // would be taken for another's. With the root "/" it follows links as the system does.
    const std::string located = _root.isWholeMachine() ? shown : _root.resolve(path).value_or("");
    if (located.empty()) {
        return {nullptr, posix::systemError("cannot load " + shown, errno).message};
    }
    // A library is loaded without a look at what it is: scanning many plug-ins should cost what loading
    // costs.
    void* library = ::dlopen(located.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (!library) {
        std::string reason = lastLoaderError(located);
        if (!isFolder(_root, path)) {
            return {nullptr, reason};
        }
        const std::optional<std::string> inner = libraryOf(_root, path, reason);
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
        return {nullptr, shown + ": no symbol " + symbol};
    }
    return {address, {}};
}

} // namespace welcomer::local
