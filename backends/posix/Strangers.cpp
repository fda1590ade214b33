#include "backends/posix/Strangers.h"

#include <set>
#include <sys/stat.h>
#include <unistd.h>

namespace welcomer::posix {

namespace {

// Whom a folder and what is in it may belong to.
struct Trusted {
    std::set<uid_t> owners{0};
    std::set<gid_t> groups{0};
};

Trusted trustedBelow(const std::string& root, bool mayBeOwn) {
    Trusted trusted;
    struct stat status = {};
    if (::stat(root.c_str(), &status) == 0) {
        trusted.owners.insert(status.st_uid);
        if ((status.st_mode & S_IWGRP) != 0) {
            trusted.groups.insert(status.st_gid); // may put anything in the place of what is below
        }
    }
    if (mayBeOwn) {
        trusted.owners.insert(::geteuid());
    }
    return trusted;
}

// Who may change this one file or folder.
//  isOnTheWay  whether it is a folder that leads to another: with a sticky bit only what is one's own can be
//              replaced there
std::string strangerAt(const std::string& path, const Trusted& trusted, bool isOnTheWay) {
    struct stat status = {};
    if (::stat(path.c_str(), &status) != 0) {
        return "";
    }
    if (!trusted.owners.contains(status.st_uid)) {
        return path + " belongs to user " + std::to_string(status.st_uid);
    }
    if (isOnTheWay && (status.st_mode & S_ISVTX) != 0) {
        return "";
    }
    if ((status.st_mode & S_IWOTH) != 0) {
        return "everybody may write " + path;
    }
    const bool isForOthers = (status.st_mode & S_IWGRP) != 0 && !trusted.groups.contains(status.st_gid);
    return isForOthers ? "group " + std::to_string(status.st_gid) + " may write " + path : "";
}

} // namespace

std::string strangerWhoMayChange(const RootFolder& root, const std::string& path, bool mayBeOwn) {
    const auto folder = root.resolve("/");
    const auto machinePath = root.resolve(path);
    if (!folder || !machinePath) {
        return "";
    }
    const Trusted trusted = trustedBelow(*folder, mayBeOwn);
    // Below a root of its own, what leads to that is not the system's.
    for (std::size_t end = machinePath->find('/', root.isWholeMachine() ? 0 : folder->size());
         end != std::string::npos; end = machinePath->find('/', end + 1)) {
        const std::string leading = end == 0 ? "/" : machinePath->substr(0, end);
        if (std::string stranger = strangerAt(leading, trusted, true); !stranger.empty()) {
            return stranger;
        }
    }
    return strangerAt(*machinePath, trusted, false);
}

} // namespace welcomer::posix
