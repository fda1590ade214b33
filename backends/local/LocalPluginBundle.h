// Bundles as shared libraries.

#pragma once

#include "backends/local/PluginFolder.h"
#include "backends/posix/RootFolder.h"
#include "backends/posix/Strangers.h"
#include "platform/PluginBundle.h"

namespace welcomer::local {

// Libraries are bound at once, keep their symbols to themselves and are never closed. The "Executable" of a
// folder is a path in it: one that leads out of the folder, also by a symbolic link, is refused. So is what others may
// change (posix/Strangers.h: root, the root folder's owner and the user are no others), and a library that is no whole
// regular file: loading would block, or end the process.
class LocalPluginBundle final : public platform::PluginBundle {
  public:
    explicit LocalPluginBundle(const posix::RootFolder& root) : LocalPluginBundle(root, PluginFolder(root)) {}
    //  pluginFolder  what plug-ins are loaded from in the place of the system's directory of them
    LocalPluginBundle(posix::RootFolder root, PluginFolder pluginFolder)
        : _root(std::move(root)),
          _pluginFolder(std::move(pluginFolder)),
          _strangers(_root) {}

    platform::PluginSymbol load(const std::string& path, const char* symbol) override;

  private:
    const posix::RootFolder _root;
    const PluginFolder _pluginFolder;
    posix::FolderStrangers _strangers;
};

} // namespace welcomer::local
