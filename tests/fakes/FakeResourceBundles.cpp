#include "tests/fakes/FakeResourceBundles.h"

namespace welcomer::fakes {

std::optional<std::string> FakeResourceBundle::pathForResource(const std::string& name,
                                                               const std::string& type) {
    _recorder.record("ResourceBundle.pathForResource " + name + ", " + type);
    const auto found = _resources.find({name, type});
    return found == _resources.end() ? std::nullopt : std::optional(found->second);
}

std::string FakeResourceBundle::localizedString(const std::string& key, const std::string& fallback) {
    _recorder.record("ResourceBundle.localizedString " + key + ", " + fallback);
    const auto found = _texts.find(key);
    return found == _texts.end() ? fallback : found->second;
}

void FakeResourceBundle::add(const std::string& name, const std::string& type, const std::string& path) {
    _resources[{name, type}] = path;
}

std::unique_ptr<platform::ResourceBundle> FakeResourceBundles::open(const std::string& path) {
    _recorder.record("ResourceBundles.open " + path);
    const auto found = _bundles.find(path);
    return std::make_unique<FakeResourceBundle>(_recorder,
                                                found == _bundles.end() ? FakeResources() : found->second);
}

std::unique_ptr<platform::ResourceBundle> FakeResourceBundles::openMainBundle() {
    _recorder.record("ResourceBundles.openMainBundle");
    return std::make_unique<FakeResourceBundle>(_recorder, FakeResources(), mainBundleTexts);
}

void FakeResourceBundles::add(const std::string& bundlePath, const std::string& name, const std::string& type,
                              const std::string& path) {
    _bundles[bundlePath][{name, type}] = path;
}

} // namespace welcomer::fakes
