// The directories in which users are looked up.

#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace welcomer::platform {

// The type of the node that searches every directory for authentication.
inline constexpr std::uint32_t kDirectoryAuthenticationSearchNode = 0x2201;

// Any thread.
class DirectoryNode {
  public:
    virtual ~DirectoryNode() = default;

    // The names of the nodes that this one searches, in its order; empty also when they cannot be found out.
    virtual std::vector<std::string> subnodeNames() = 0;

    // Those of them that cannot be reached now. May block for as long as reaching them takes.
    virtual std::vector<std::string> unreachableSubnodeNames() = 0;
};

// The default directory connection. Any thread.
class DirectoryService {
  public:
    virtual ~DirectoryService() = default;

    // Opens the node of a type.
    //  result  null when that fails
    virtual std::unique_ptr<DirectoryNode> openNode(std::uint32_t nodeType) = 0;

    // Whether a node's name is that of a node on this machine itself.
    virtual bool isLocalNodeName(const std::string& name) = 0;
};

} // namespace welcomer::platform
