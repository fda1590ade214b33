// Files and folders of the machine, below a root folder.

#pragma once

#include "backends/local/PluginFolder.h"
#include "backends/posix/RootFolder.h"
#include "platform/FileSystem.h"

namespace welcomer::local {

class LocalFileSystem final : public platform::FileSystem {
  public:
    explicit LocalFileSystem(const posix::RootFolder& root) : LocalFileSystem(root, PluginFolder(root)) {}
    //  pluginFolder  what is listed in the place of the system's plug-in directory
    LocalFileSystem(posix::RootFolder root, PluginFolder pluginFolder)
        : _root(std::move(root)),
          _pluginFolder(std::move(pluginFolder)) {}

    bool exists(const std::string& path) override;
    platform::Outcome remove(const std::string& path) override;
    platform::Outcome createDirectory(const std::string& path, std::uint32_t mode) override;

    // The copy is written under a temporary name and then linked, so that a process that is killed never
    // leaves a part of it under its own name. Of the permissions the read, write and execute bits are copied.
    platform::Outcome copy(const std::string& source, const std::string& destination) override;

    std::optional<std::vector<std::string>> list(const std::string& path) override;
    std::optional<std::string> readText(const std::string& path) override;
    platform::Outcome writeText(const std::string& path, const std::string& text) override;

  private:
    const posix::RootFolder _root;
    const PluginFolder _pluginFolder;
};

} // namespace welcomer::local
