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

// One bundle, also for use on its own. Recorded as "ResourceBundle.pathForResource name, type". Any thread
// once its resources are chosen.
class FakeResourceBundle final : public platform::ResourceBundle {
  public:
    explicit FakeResourceBundle(CallRecorder& recorder, FakeResources resources = {})
        : _recorder(recorder),
          _resources(std::move(resources)) {}

    std::optional<std::string> pathForResource(const std::string& name, const std::string& type) override;

    // Gives the bundle a resource. Nothing needs to be at its path.
    void add(const std::string& name, const std::string& type, const std::string& path);

  private:
    CallRecorder& _recorder;
    FakeResources _resources;
};

// Recorded as "ResourceBundles.open /path". Any thread once its resources are chosen.
class FakeResourceBundles final : public platform::ResourceBundles {
  public:
    explicit FakeResourceBundles(CallRecorder& recorder) : _recorder(recorder) {}

    std::unique_ptr<platform::ResourceBundle> open(const std::string& path) override;

    // Gives the bundle at a path a resource. Bundles that are open already do not see it.
    void add(const std::string& bundlePath, const std::string& name, const std::string& type,
             const std::string& path);

  private:
    CallRecorder& _recorder;
    std::map<std::string, FakeResources> _bundles;
};

} // namespace welcomer::fakes
