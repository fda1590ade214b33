#include "tools/welcomer/checks/CodeFolders.h"

#include "backends/posix/RootFolder.h"

#include <fstream>
#include <set>
#include <sstream>
#include <sys/stat.h>
#include <unistd.h>

namespace welcomer::tool {

namespace {

// Whom a folder and what is in it may belong to.
std::set<uid_t> trustedOwners(const std::string& root, bool mayBeOwn) {
    std::set<uid_t> owners{0};
    struct stat status = {};
    if (::stat(root.c_str(), &status) == 0) {
        owners.insert(status.st_uid);
    }
    if (mayBeOwn) {
        owners.insert(::geteuid());
    }
    return owners;
}

// Who may change this one file or folder.
//  isOnTheWay  whether it is a folder that leads to another: with a sticky bit only what is one's own can be
//              replaced there
std::string strangerAt(const std::string& path, const std::set<uid_t>& owners, bool isOnTheWay) {
    struct stat status = {};
    if (::stat(path.c_str(), &status) != 0) {
        return "";
    }
    if (!owners.contains(status.st_uid)) {
        return path + " belongs to user " + std::to_string(status.st_uid);
    }
    if (isOnTheWay && (status.st_mode & S_ISVTX) != 0) {
        return "";
    }
    if ((status.st_mode & S_IWOTH) != 0) {
        return "everybody may write " + path;
    }
    const bool isForGroup = (status.st_mode & S_IWGRP) != 0 && status.st_gid != 0;
    return isForGroup ? "group " + std::to_string(status.st_gid) + " may write " + path : "";
}

} // namespace

std::string strangerWhoMayChange(const std::string& root, const std::string& path, bool mayBeOwn) {
    const auto machinePath = posix::RootFolder(root).resolve(path);
    if (!machinePath) {
        return "";
    }
    const std::set<uid_t> owners = trustedOwners(root, mayBeOwn);
    // Below a root of its own, what leads to that is not the system's.
    for (std::size_t end = machinePath->find('/', root == "/" ? 0 : root.size()); end != std::string::npos;
         end = machinePath->find('/', end + 1)) {
        const std::string folder = end == 0 ? "/" : machinePath->substr(0, end);
        if (std::string stranger = strangerAt(folder, owners, true); !stranger.empty()) {
            return stranger;
        }
    }
    return strangerAt(*machinePath, owners, false);
}

std::vector<std::string> loadedFiles() {
    std::ifstream maps("/proc/self/maps");
    std::set<std::string> files;
    for (std::string line; std::getline(maps, line);) {
        std::istringstream words(line);
        std::string range, rights, offset, device, node, path;
        words >> range >> rights >> offset >> device >> node >> std::ws;
        std::getline(words, path);
        if (rights.find('x') != std::string::npos && path.starts_with('/')) {
            files.insert(path);
        }
    }
    return {files.begin(), files.end()};
}

Finding checkLoadedCode() {
    const std::vector<std::string> files = loadedFiles();
    for (const std::string& file : files) {
        const std::string stranger = strangerWhoMayChange("/", file, true);
        if (!stranger.empty()) {
            std::string text = "code is loaded from ";
            text.append(file).append(", and ").append(stranger);
            return {"programs", Verdict::Wrong, text, "install the packages anew, or give it back to root"};
        }
    }
    return {"programs", Verdict::Right,
            "only root may change the " + std::to_string(files.size()) + " files that code is loaded from"};
}

} // namespace welcomer::tool
