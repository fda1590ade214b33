// An application's bundle of resources.

#pragma once

#include <memory>
#include <optional>
#include <string>

namespace welcomer::platform {

// Any thread.
class ResourceBundle {
  public:
    virtual ~ResourceBundle() = default;

    // The path of a resource, below the platform's root as every path, or none when the bundle has no such
    // resource.
    //  name  the resource's name without its type
    //  type  its type, the file name's extension without the dot; empty: the name stands alone
    virtual std::optional<std::string> pathForResource(const std::string& name, const std::string& type) = 0;

    // The text under a key of the bundle's default string table, in the user's language where the bundle has
    // it. May read a file.
    //  fallback  the result when there is no such text
    virtual std::string localizedString(const std::string& key, const std::string& fallback) = 0;
};

// Any thread.
class ResourceBundles {
  public:
    virtual ~ResourceBundles() = default;

    // Opens the bundle at a path. A bundle that does not exist has no resources.
    virtual std::unique_ptr<ResourceBundle> open(const std::string& path) = 0;

    // Opens the main bundle: that of the running application. An application without one has no resources.
    virtual std::unique_ptr<ResourceBundle> openMainBundle() = 0;
};

} // namespace welcomer::platform
