#include "backends/local/LocalResourceBundles.h"

#include "backends/local/DictionaryFile.h"
#include "platform/Path.h"

#include <cstdlib>
#include <string_view>
#include <utility>
#include <vector>

namespace welcomer::local {

namespace {

constexpr char kTable[] = "/Localizable.strings";

// Where the user's language may have its table, the best first: "/de_DE", "/de", and the folder itself.
std::vector<std::string> languageFolders() {
    std::vector<std::string> folders;
    for (const char* variable : {"LC_ALL", "LC_MESSAGES", "LANG"}) {
        const char* const value = std::getenv(variable);
        if (!value || *value == '\0') {
            continue;
        }
        const std::string language =
            std::string(value).substr(0, std::string_view(value).find_first_of(".@"));
        if (language.find('/') == std::string::npos) {
            folders.push_back("/" + language);
            folders.push_back("/" + language.substr(0, language.find('_')));
        }
        break;
    }
    folders.emplace_back();
    return folders;
}

class LocalResourceBundle final : public platform::ResourceBundle {
  public:
    LocalResourceBundle(posix::RootFolder root, std::string path)
        : _root(std::move(root)),
          _path(std::move(path)) {}

    std::optional<std::string> pathForResource(const std::string& name, const std::string& type) override {
        if (name.empty()) {
            return std::nullopt;
        }
        const std::string file = type.empty() ? name : name + "." + type;
        std::string path = platform::joinPath(platform::joinPath(_path, "Resources"), file);
        return _root.exists(path) ? std::optional(std::move(path)) : std::nullopt;
    }

    std::string localizedString(const std::string& key, const std::string& fallback) override {
        for (const std::string& folder : languageFolders()) {
            const PropertyList::Dictionary table =
                readDictionaryFile(_root, platform::joinPath(_path, "Resources") + folder + kTable).values;
            const auto found = table.find(key);
            if (found != table.end() && found->second.string()) {
                return *found->second.string();
            }
        }
        return fallback;
    }

  private:
    const posix::RootFolder _root;
    const std::string _path;
};

} // namespace

std::unique_ptr<platform::ResourceBundle> LocalResourceBundles::open(const std::string& path) {
    return std::make_unique<LocalResourceBundle>(_root, path);
}

std::unique_ptr<platform::ResourceBundle> LocalResourceBundles::openMainBundle() {
    return std::make_unique<LocalResourceBundle>(
        posix::RootFolder(_mainBundle.empty() ? "/nonexistent" : "/"), _mainBundle);
}

} // namespace welcomer::local
