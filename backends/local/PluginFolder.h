// The folder that the delegate plug-ins of this machine are in.

#pragma once

#include "backends/posix/RootFolder.h"

#include <functional>
#include <string>

namespace welcomer::local {

// Packages make no folders at the top of a machine: where platform::kPluginDirectory does not exist, a folder that they
// may put plug-ins into serves in its place. Asked anew each time. Any thread.
class PluginFolder {
  public:
    using Packages = std::function<std::string()>;

    //  packages  gives that folder, a path of the system; asked only where it serves
    explicit PluginFolder(posix::RootFolder root, Packages packages = builtIn);

    // The one of this build, which a machine's settings may change.
    static std::string builtIn();

    // Which of the two serves now, a path of the system.
    std::string serving() const;

    // The path with the serving folder in the place of the system's directory, if it is that or in it.
    std::string located(const std::string& path) const;

  private:
    const posix::RootFolder _root;
    const Packages _packages;
};

} // namespace welcomer::local
