// The folder below which every file is looked up.

#pragma once

#include "backends/posix/FileDescriptor.h"

#include <fcntl.h>
#include <optional>
#include <string>
#include <sys/types.h>
#include <utility>

namespace welcomer::posix {

// A path's last component, trailing slashes dropped, and the folder that it is in.
struct PathParts {
    std::string folder; // with a slash at its end
    std::string name;
};
PathParts splitPath(const std::string& path);

// Where an entry of a folder is, for the calls whose names end in "at": what the entry is, a link among them,
// is left to the call.
class FolderEntry {
  public:
    FolderEntry(FileDescriptor folder, std::string name)
        : _folder(std::move(folder)),
          _name(std::move(name)) {}
    // A path of this machine.
    explicit FolderEntry(std::string path) : _folderNumber(AT_FDCWD), _name(std::move(path)) {}

    // Whether there is such a folder. Without it `errno` has told why, and the number below leads nowhere.
    explicit operator bool() const { return folder() >= 0 || folder() == AT_FDCWD; }
    int folder() const { return _folderNumber == AT_FDCWD ? AT_FDCWD : _folder.get(); }
    const char* name() const { return _name.c_str(); }

  private:
    FileDescriptor _folder;
    int _folderNumber = -1;
    std::string _name;
};

// Paths are those of the system, absolute; trailing slashes mean nothing. Below another root than "/" the
// system's links lead to where they lead in the system: an absolute one to below the root, and none out of
// it. With the root "/" each operation is the system call of its name and nothing more. Any thread.
class RootFolder {
  public:
    // "/" leaves every path as it is.
    explicit RootFolder(std::string path);

    bool isWholeMachine() const { return _prefix.empty(); }

    // Opens what is at a path, as open(2) does; the descriptor is closed on exec.
    //  result  none when that failed; errno then says why
    FileDescriptor open(const std::string& path, int flags, mode_t mode = 0) const;

    // Whether something is at a path; a link is followed. errno tells why not.
    bool exists(const std::string& path) const;

    // The last component of a path, which is not followed when it is a link.
    FolderEntry entry(const std::string& path) const;

    // A path of this machine that has no links in it, for what takes nothing but a path: a program, and the
    // loader of libraries. None when nothing is there.
    std::optional<std::string> resolve(const std::string& path) const;

    // The path as people see it on this machine. Not to be opened: a link may lead out of the root.
    std::string shown(const std::string& path) const;

  private:
    FileDescriptor _open() const;

    std::string _prefix;
};

} // namespace welcomer::posix
