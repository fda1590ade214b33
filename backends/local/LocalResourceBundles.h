// Bundles as folders that hold a folder "Resources".

#pragma once

#include "backends/local/RootFolder.h"
#include "platform/ResourceBundle.h"

namespace welcomer::local {

class LocalResourceBundles final : public platform::ResourceBundles {
  public:
    explicit LocalResourceBundles(RootFolder root) : _root(std::move(root)) {}

    std::unique_ptr<platform::ResourceBundle> open(const std::string& path) override;

  private:
    const RootFolder _root;
};

} // namespace welcomer::local
