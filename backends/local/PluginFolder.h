// The folder that the delegate plug-ins of this machine are in.

#pragma once

#include "backends/posix/RootFolder.h"

#include <string>

namespace welcomer::local {

// Packages make no folders at the top of a machine: where platform::kPluginDirectory does not exist, a folder that they
// may put plug-ins into serves in its place. Asked anew each time. Any thread.
class PluginFolder {
  public:
    //  packages  that folder, a path of the system
    explicit PluginFolder(posix::RootFolder root, std::string packages = defaultFolder());

    // Where this build's installation has it.
    static std::string defaultFolder();

    // Which of the two serves now, a path of the system.
    std::string serving() const;

    // The path with the serving folder in the place of the system's directory, if it is that or in it.
    std::string located(const std::string& path) const;

  private:
    const posix::RootFolder _root;
    const std::string _packages;
};

} // namespace welcomer::local
