#include "backends/local/LocalPluginBundle.h"

#include "backends/local/LibraryFile.h"
#include "backends/posix/FileContent.h"
#include "backends/posix/Strangers.h"
#include "backends/posix/SystemError.h"
#include "platform/Path.h"
#include "propertylist/Lookup.h"
#include "propertylist/PropertyListReader.h"

#include <cerrno>
#include <dlfcn.h>
#include <optional>
#include <utility>

namespace welcomer::local {

namespace {

constexpr std::size_t kMaximumInfoSize = std::size_t{1} << 20;

// The library of a folder as a path of the system, or none with the reason.
std::optional<std::string> libraryOf(const posix::RootFolder& root, const std::string& path,
                                     std::string& reason) {
    const std::string folder = root.shown(path);
    const std::string infoPath = platform::joinPath(path, "Info.plist");
    for (const std::string& each : {posix::splitPath(path).folder, infoPath}) {
        reason = posix::strangerWhoMayChange(root, each, true);
        if (!reason.empty()) {
            return std::nullopt;
        }
    }
    std::string bytes;
    if (const int error = posix::readFile(root, infoPath, bytes, kMaximumInfoSize)) {
        reason = posix::systemError("cannot read " + root.shown(infoPath), error).message;
        return std::nullopt;
    }
    const PropertyListReadResult info = readPropertyList(bytes);
    if (!info) {
        reason = root.shown(infoPath) + ": " + info.error;
        return std::nullopt;
    }
    const std::string* const name = textIn(*info.value, "Executable");
    if (!name || name->empty()) {
        reason = root.shown(infoPath) + ": no Executable";
        return std::nullopt;
    }
    const std::string library = platform::joinPath(path, *name);
    const std::optional<std::string> resolved = root.resolve(library);
    const std::optional<std::string> inside = root.resolve(path);
    if (!resolved || !inside) {
        reason = folder + ": its Executable is missing";
        return std::nullopt;
    }
    if (!resolved->starts_with(platform::joinPath(*inside, ""))) {
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
    std::string library = path;
    std::optional<LibraryFile> file(std::in_place, _root, path);
    std::string reason;
    if (file->isFolder()) {
        const std::optional<std::string> inner = libraryOf(_root, path, reason);
        if (!inner) {
            return {nullptr, reason};
        }
        library = *inner;
        file.emplace(_root, library);
    }
    reason = file->reasonNotToLoad(_strangers);
    if (!reason.empty()) {
        return {nullptr, reason};
    }
    file.reset(); // no descriptor of this one's is open while a library's own code runs
    // The loader knows libraries by their paths, so that a descriptor's in /proc, whose number is used again,
    // would be taken for another's. With the root "/" it follows links as the system does.
    const std::string located =
        _root.isWholeMachine() ? _root.shown(library) : _root.resolve(library).value_or("");
    if (located.empty()) {
        return {nullptr, posix::systemError("cannot load " + _root.shown(library), errno).message};
    }
    void* const loaded = ::dlopen(located.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (!loaded) {
        return {nullptr, lastLoaderError(located)};
    }
    const void* address = ::dlsym(loaded, symbol);
    if (!address) {
        return {nullptr, _root.shown(path) + ": no symbol " + symbol};
    }
    return {address, {}};
}

} // namespace welcomer::local
