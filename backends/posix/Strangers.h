// Who may change what code is loaded from.

#pragma once

#include "backends/posix/RootFolder.h"

#include <mutex>
#include <set>
#include <string>
#include <sys/stat.h>
#include <sys/types.h>
#include <utility>

namespace welcomer::posix {

// Whether somebody whom the user need not trust may change a file or a folder, or put another one in its place. The
// superuser may, and whoever the root folder belongs to; so may their groups: the superuser's, and the root folder's
// where that may write the root folder itself. What is missing is passed over.
//  path      absolute, below the root; links are followed
//  mayBeOwn  whether what belongs to the user who asks is as good, since nobody else loads it
//  result    who may, in one line; empty when nobody may
// Any thread.
std::string strangerWhoMayChange(const RootFolder& root, const std::string& path, bool mayBeOwn);

// Whom a folder and what is in it may belong to.
struct TrustedOwners {
    std::set<uid_t> users{0};
    std::set<gid_t> groups{0};
};

// The same for one file of a folder after the other, with what is one's own being as good. What was found of the folder,
// and of those that lead to it, is remembered as long as the folder itself stays as it is. Any thread.
class FolderStrangers {
  public:
    explicit FolderStrangers(RootFolder root) : _root(std::move(root)) {}

    // Who may change a file or its folder: in one with a sticky bit a file is safe, but whoever may write there may add
    // to it.
    //  path    absolute, below the root
    //  status  that of the file at the path; null where a link is there, or nothing that could be opened
    std::string whoMayChange(const std::string& path, const struct stat* status);

  private:
    void _look(const std::string& folder);

    const RootFolder _root;
    std::mutex _mutex;
    // The folder that was asked for last, and what was found.
    std::string _folder;
    struct stat _status = {};
    std::string _machinePath; // without links; empty when there is none
    TrustedOwners _trusted;
    std::string _stranger;
};

} // namespace welcomer::posix
