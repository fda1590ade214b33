// Bundles as shared libraries.

#pragma once

#include "backends/posix/RootFolder.h"
#include "platform/PluginBundle.h"

namespace welcomer::local {

// Libraries are bound at once, keep their symbols to themselves and are never closed. The "Executable" of a
// folder is a path in it: one that leads out of the folder, also by a symbolic link, is refused.
class LocalPluginBundle final : public platform::PluginBundle {
  public:
    explicit LocalPluginBundle(posix::RootFolder root) : _root(std::move(root)) {}

    platform::PluginSymbol load(const std::string& path, const char* symbol) override;

  private:
    const posix::RootFolder _root;
};

} // namespace welcomer::local
