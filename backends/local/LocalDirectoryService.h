// Directories as the name service switch has them.

#pragma once

#include "platform/DirectoryService.h"
#include "platform/FileSystem.h"

namespace welcomer::local {

// The authentication search node's subnodes are the sources of "passwd" in /etc/nsswitch.conf, "files" where
// that says nothing. One whose module does not load is unreachable; no directory is asked anything. The
// modules are this machine's, whatever the root folder. Nodes of other types do not exist.
class LocalDirectoryService final : public platform::DirectoryService {
  public:
    //  fileSystem  borrowed, must outlive this object and its nodes
    explicit LocalDirectoryService(platform::FileSystem& fileSystem) : _fileSystem(fileSystem) {}

    std::unique_ptr<platform::DirectoryNode> openNode(std::uint32_t nodeType) override;
    bool isLocalNodeName(const std::string& name) override;

  private:
    platform::FileSystem& _fileSystem;
};

} // namespace welcomer::local
