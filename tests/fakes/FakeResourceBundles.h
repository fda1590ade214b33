// Resource bundles whose resources tests choose.

#pragma once

#include "platform/ResourceBundle.h"
#include "tests/fakes/CallRecorder.h"

#include <map>
#include <string>
#include <utility>

namespace welcomer::fakes {

// Resources by name and type, with the path of each.
using FakeResources = std::map<std::pair<std::string, std::string>, std::string>;

// The texts of a string table by key.
using FakeTexts = std::map<std::string, std::string>;

// One bundle, also for use on its own. Recorded as "ResourceBundle.pathForResource name, type". Any thread
// once its resources are chosen.
class FakeResourceBundle final : public platform::ResourceBundle {
  public:
    explicit FakeResourceBundle(CallRecorder& recorder, FakeResources resources = {}, FakeTexts texts = {})
        : _recorder(recorder),
          _resources(std::move(resources)),
          _texts(std::move(texts)) {}

    std::optional<std::string> pathForResource(const std::string& name, const std::string& type) override;
    std::string localizedString(const std::string& key, const std::string& fallback) override;

    // Gives the bundle a resource. Nothing needs to be at its path.
    void add(const std::string& name, const std::string& type, const std::string& path);

  private:
    CallRecorder& _recorder;
    FakeResources _resources;
    FakeTexts _texts;
};

// Recorded as "ResourceBundles.open /path" and "ResourceBundles.openMainBundle". Any thread once its
// resources are chosen.
class FakeResourceBundles final : public platform::ResourceBundles {
  public:
    explicit FakeResourceBundles(CallRecorder& recorder) : _recorder(recorder) {}

    std::unique_ptr<platform::ResourceBundle> open(const std::string& path) override;
    std::unique_ptr<platform::ResourceBundle> openMainBundle() override;

    // The main bundle's texts, in the user's language.
    FakeTexts mainBundleTexts;

    // Gives the bundle at a path a resource. Bundles that are open already do not see it.
    void add(const std::string& bundlePath, const std::string& name, const std::string& type,
             const std::string& path);

  private:
    CallRecorder& _recorder;
    std::map<std::string, FakeResources> _bundles;
};

} // namespace welcomer::fakes
