#include "backends/local/LocalResourceBundles.h"

#include "platform/Path.h"

#include <sys/stat.h>
#include <utility>

namespace welcomer::local {

namespace {

class LocalResourceBundle final : public platform::ResourceBundle {
  public:
    LocalResourceBundle(RootFolder root, std::string path) : _root(std::move(root)), _path(std::move(path)) {}

    std::optional<std::string> pathForResource(const std::string& name, const std::string& type) override {
        if (name.empty()) {
            return std::nullopt;
        }
        const std::string file = type.empty() ? name : name + "." + type;
        std::string path = platform::joinPath(platform::joinPath(_path, "Resources"), file);
        struct stat status = {};
        if (::stat(_root.locate(path).c_str(), &status) != 0) {
            return std::nullopt;
        }
        return path;
    }

  private:
    const RootFolder _root;
    const std::string _path;
};

} // namespace

std::unique_ptr<platform::ResourceBundle> LocalResourceBundles::open(const std::string& path) {
    return std::make_unique<LocalResourceBundle>(_root, path);
}

} // namespace welcomer::local
