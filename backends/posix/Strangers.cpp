#include "backends/posix/Strangers.h"

#include <fcntl.h>
#include <unistd.h>

namespace welcomer::posix {

namespace {

TrustedOwners trustedBelow(const std::string& root, bool mayBeOwn) {
    TrustedOwners trusted;
    struct stat status = {};
    if (::stat(root.c_str(), &status) == 0) {
        trusted.users.insert(status.st_uid);
        if ((status.st_mode & S_IWGRP) != 0) {
            trusted.groups.insert(status.st_gid); // may put anything in the place of what is below
        }
    }
    if (mayBeOwn) {
        trusted.users.insert(::geteuid());
    }
    return trusted;
}

// Who may change this one file or folder.
//  isOnTheWay  whether it is a folder that leads to another: with a sticky bit only what is one's own can be
//              replaced there
std::string strangerAt(const std::string& path, const struct stat& status, const TrustedOwners& trusted,
                       bool isOnTheWay) {
    if (!trusted.users.contains(status.st_uid)) {
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

std::string strangerAt(const std::string& path, const TrustedOwners& trusted, bool isOnTheWay) {
    struct stat status = {};
    return ::stat(path.c_str(), &status) == 0 ? strangerAt(path, status, trusted, isOnTheWay) : "";
}

// The one who may change a file or folder, or what leads to it.
//  machinePath  without links
//  begin        where the root folder's own path ends in it
std::string strangerOnTheWay(const std::string& machinePath, std::size_t begin,
                             const TrustedOwners& trusted) {
    for (std::size_t end = machinePath.find('/', begin); end != std::string::npos;
         end = machinePath.find('/', end + 1)) {
        const std::string leading = end == 0 ? "/" : machinePath.substr(0, end);
        if (std::string stranger = strangerAt(leading, trusted, true); !stranger.empty()) {
            return stranger;
        }
    }
    return strangerAt(machinePath, trusted, false);
}

// What is found of a path.
struct Finding {
    std::string machinePath; // without links; empty when nothing is there
    TrustedOwners trusted;
    std::string stranger;
};

Finding look(const RootFolder& root, const std::string& path, bool mayBeOwn) {
    const auto folder = root.resolve("/");
    const auto machinePath = root.resolve(path);
    if (!folder || !machinePath) {
        return {};
    }
    const TrustedOwners trusted = trustedBelow(*folder, mayBeOwn);
    // Below a root of its own, what leads to that is not the system's.
    const std::size_t begin = root.isWholeMachine() ? 0 : folder->size();
    return {*machinePath, trusted, strangerOnTheWay(*machinePath, begin, trusted)};
}

bool isSame(const struct stat& one, const struct stat& other) {
    return one.st_dev == other.st_dev && one.st_ino == other.st_ino && one.st_mode == other.st_mode &&
           one.st_uid == other.st_uid && one.st_gid == other.st_gid &&
           one.st_ctim.tv_sec == other.st_ctim.tv_sec && one.st_ctim.tv_nsec == other.st_ctim.tv_nsec;
}

bool readStatus(const RootFolder& root, const std::string& path, struct stat& status) {
    if (root.isWholeMachine()) {
        return ::stat(path.c_str(), &status) == 0;
    }
    const FileDescriptor file = root.open(path, O_PATH);
    return file && ::fstat(file.get(), &status) == 0;
}

} // namespace

std::string strangerWhoMayChange(const RootFolder& root, const std::string& path, bool mayBeOwn) {
    return look(root, path, mayBeOwn).stranger;
}

std::string FolderStrangers::whoMayChange(const std::string& path, const struct stat* status) {
    const std::lock_guard lock(_mutex);
    const auto [folder, name] = splitPath(path);
    _look(folder);
    if (!_stranger.empty()) {
        return _stranger;
    }
    return status && !_machinePath.empty()
               ? strangerAt(_machinePath + (_machinePath == "/" ? "" : "/") + name, *status, _trusted, false)
               : strangerWhoMayChange(_root, path, true);
}

void FolderStrangers::_look(const std::string& folder) {
    struct stat status = {};
    if (readStatus(_root, folder, status) && folder == _folder && isSame(status, _status)) {
        return;
    }
    Finding found = look(_root, folder, true);
    _folder = folder;
    _status = status;
    _machinePath = std::move(found.machinePath);
    _trusted = std::move(found.trusted);
    _stranger = std::move(found.stranger);
}

} // namespace welcomer::posix
