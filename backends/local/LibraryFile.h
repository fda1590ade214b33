// A library's file before it is loaded.

#pragma once

#include "backends/posix/FileDescriptor.h"
#include "backends/posix/RootFolder.h"
#include "backends/posix/Strangers.h"

#include <string>
#include <sys/stat.h>

namespace welcomer::local {

// What lies at a path, open where it may be read. Opening never blocks, whatever it is.
class LibraryFile {
  public:
    //  path  absolute, below the root; a link is followed
    LibraryFile(const posix::RootFolder& root, std::string path);

    bool isFolder() const;

    // Why it must not be given to the loader, which trusts what it maps: others may change it or its folder, it is no
    // regular file, or it is shorter than it says itself or being changed, as while it is copied to its place. What is no
    // library at all is left to the loader to tell.
    //  result  one line; empty when nothing speaks against it
    std::string reasonNotToLoad(posix::FolderStrangers& strangers) const;

  private:
    const posix::RootFolder& _root;
    const std::string _path;
    bool _isLink = false;
    posix::FileDescriptor _file;
    int _error = 0; // why it is not open
    struct stat _status = {};
};

} // namespace welcomer::local
