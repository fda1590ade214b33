#include "backends/local/LocalDirectoryService.h"

#include <algorithm>
#include <array>
#include <dlfcn.h>
#include <optional>
#include <string_view>

namespace welcomer::local {

namespace {

constexpr std::string_view kBlanks = " \t\r";
constexpr std::array<std::string_view, 6> kLocalNames = {"files",   "compat",   "db",
                                                         "systemd", "altfiles", "extrausers"};

std::string_view withoutBlanksBefore(std::string_view text) {
    return text.substr(std::min(text.find_first_not_of(kBlanks), text.size()));
}

// The words of a line's sources; actions in brackets are left out.
std::vector<std::string> sourcesIn(std::string_view line) {
    std::vector<std::string> sources;
    line = withoutBlanksBefore(line);
    while (!line.empty()) {
        if (line.front() == '[') {
            line = line.substr(std::min(line.find(']'), line.size() - 1) + 1);
        } else {
            const std::string_view word = line.substr(0, line.find_first_of(" \t\r["));
            sources.emplace_back(word);
            line.remove_prefix(word.size());
        }
        line = withoutBlanksBefore(line);
    }
    return sources;
}

// The sources of "passwd", none when no line names them.
std::optional<std::vector<std::string>> passwdSources(std::string_view text) {
    constexpr std::string_view kDatabase = "passwd";
    std::optional<std::vector<std::string>> sources;
    while (!text.empty()) {
        std::string_view line = text.substr(0, text.find('\n'));
        text.remove_prefix(std::min(line.size() + 1, text.size()));
        line = withoutBlanksBefore(line.substr(0, line.find('#')));
        if (!line.starts_with(kDatabase)) {
            continue;
        }
        line = withoutBlanksBefore(line.substr(kDatabase.size()));
        if (line.starts_with(':')) {
            sources = sourcesIn(line.substr(1));
        }
    }
    return sources;
}

bool isModuleName(const std::string& name) {
    return !name.empty() && name.find_first_not_of("abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ"
                                                   "0123456789_-") == std::string::npos;
}

bool isReachable(const std::string& source) {
    if (source == "files") {
        return true; // part of the C library
    }
    if (!isModuleName(source)) {
        return false;
    }
    void* const module = ::dlopen(("libnss_" + source + ".so.2").c_str(), RTLD_NOW | RTLD_LOCAL);
    if (module) {
        ::dlclose(module);
    }
    return module != nullptr;
}

class AuthenticationNode final : public platform::DirectoryNode {
  public:
    explicit AuthenticationNode(platform::FileSystem& fileSystem) : _fileSystem(fileSystem) {}

    std::vector<std::string> subnodeNames() override {
        const std::optional<std::string> text = _fileSystem.readText("/etc/nsswitch.conf");
        return passwdSources(text.value_or("")).value_or(std::vector<std::string>{"files"});
    }

    std::vector<std::string> unreachableSubnodeNames() override {
        std::vector<std::string> names = subnodeNames();
        std::erase_if(names, isReachable);
        return names;
    }

  private:
    platform::FileSystem& _fileSystem;
};

} // namespace

std::unique_ptr<platform::DirectoryNode> LocalDirectoryService::openNode(std::uint32_t nodeType) {
    if (nodeType != platform::kDirectoryAuthenticationSearchNode) {
        return nullptr;
    }
    return std::make_unique<AuthenticationNode>(_fileSystem);
}

bool LocalDirectoryService::isLocalNodeName(const std::string& name) {
    return std::ranges::count(kLocalNames, name) > 0;
}

} // namespace welcomer::local
