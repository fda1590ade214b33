// The folder below which every file is looked up.

#pragma once

#include <string>

namespace welcomer::local {

class RootFolder {
  public:
    // "/" leaves every path as it is.
    explicit RootFolder(std::string path) : _prefix(std::move(path)) {
        while (_prefix.ends_with('/')) {
            _prefix.pop_back();
        }
    }

    // Where a path of the system lies on this machine, without trailing slashes, so that the last component
    // is never followed when it is a symbolic link. Any thread.
    std::string locate(const std::string& path) const {
        std::string located = _prefix + path;
        while (located.size() > 1 && located.ends_with('/')) {
            located.pop_back();
        }
        return located;
    }

  private:
    std::string _prefix;
};

} // namespace welcomer::local
