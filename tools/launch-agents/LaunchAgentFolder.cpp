#include "tools/launch-agents/LaunchAgentFolder.h"

#include "backends/posix/UnfinishedCopy.h"
#include "log/PCLogManager.h"
#include "platform/FileSystem.h"

#include <algorithm>
#include <cerrno>
#include <dirent.h>
#include <fcntl.h>
#include <memory>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>
#include <utility>

namespace welcomer::launch {

namespace {

struct CloseFolder {
    void operator()(DIR* folder) const { ::closedir(folder); }
};
using Folder = std::unique_ptr<DIR, CloseFolder>;

std::string systemText(int number) {
    return std::generic_category().message(number);
}

void logRefusal(const std::string& path, const std::string& reason) {
    WL_LOG("Refusing launch agent %@: %@", path, reason);
}

// Why this owner and these permissions are not to be trusted, or nothing.
std::string distrust(const struct stat& status, uid_t owner) {
    if (status.st_uid != owner) {
        return "it belongs to another user";
    }
    return (status.st_mode & (S_IWGRP | S_IWOTH)) != 0 ? "others may write to it" : "";
}

// Reads a file of the folder that may be trusted.
//  content  receives what was read
//  result   nothing, or why it is refused
std::string readTrusted(int folder, const std::string& name, uid_t owner, std::string& content) {
    // Neither a link nor a pipe without a writer may lead or hold this process elsewhere.
    const int file =
        ::openat(folder, name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC);
    if (file < 0) {
        return errno == ELOOP ? "it is a symbolic link" : systemText(errno);
    }
    std::string refusal = [&]() -> std::string {
        struct stat status {};
        if (::fstat(file, &status) != 0) {
            return systemText(errno);
        }
        if (!S_ISREG(status.st_mode)) {
            return "it is no regular file";
        }
        if (std::string reason = distrust(status, owner); !reason.empty()) {
            return reason;
        }
        char buffer[16384];
        while (true) {
            const ssize_t count = ::read(file, buffer, sizeof buffer);
            if (count < 0 && errno == EINTR) {
                continue;
            }
            if (count <= 0) {
                return count == 0 ? "" : systemText(errno);
            }
            content.append(buffer, static_cast<std::size_t>(count));
            if (content.size() > platform::kMaximumTextSize) {
                return "it is too long";
            }
        }
    }();
    ::close(file);
    return refusal;
}

// The definition in a file of the folder, or why there is none.
LaunchAgentResult readFile(int folder, const std::string& name, uid_t owner) {
    // An editor's backup of a definition is none, whatever is in it.
    if (!name.ends_with(".plist")) {
        return {std::nullopt, "it is no property list by its name"};
    }
    std::string content;
    if (std::string reason = readTrusted(folder, name, owner, content); !reason.empty()) {
        return {std::nullopt, std::move(reason)};
    }
    LaunchAgentResult result = readLaunchAgent(content);
    if (result.agent) {
        result.agent->file = name;
        result.agent->content = std::move(content);
    }
    return result;
}

std::vector<std::string> sortedNames(DIR* folder) {
    std::vector<std::string> names;
    while (const dirent* const entry = ::readdir(folder)) {
        const std::string name = entry->d_name;
        if (name != "." && name != "..") {
            names.push_back(name);
        }
    }
    std::ranges::sort(names);
    return names;
}

} // namespace

std::vector<LaunchAgent> readLaunchAgents(const std::string& path, uid_t owner) {
    const int descriptor = ::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (descriptor < 0) {
        if (errno != ENOENT) {
            logRefusal(path, systemText(errno));
        }
        return {};
    }
    struct stat status {};
    const int failure = ::fstat(descriptor, &status) == 0 ? 0 : errno;
    const Folder folder(::fdopendir(descriptor));
    if (failure != 0 || !folder) {
        logRefusal(path, systemText(failure != 0 ? failure : errno));
        return {};
    }
    if (const std::string reason = distrust(status, owner); !reason.empty()) {
        logRefusal(path, reason);
        return {};
    }
    posix::removeAbandonedCopies(descriptor);
    std::vector<LaunchAgent> agents;
    for (const std::string& name : sortedNames(folder.get())) {
        if (posix::isNameOfCopy(name)) {
            continue; // it gets its own name once it is whole
        }
        LaunchAgentResult read = readFile(descriptor, name, owner);
        if (read.agent && std::ranges::find(agents, read.agent->label, &LaunchAgent::label) != agents.end()) {
            read = {std::nullopt, "an earlier file has the same label"};
        }
        if (read.agent) {
            agents.push_back(std::move(*read.agent));
        } else {
            logRefusal(std::string(path).append("/").append(name), read.error);
        }
    }
    return agents;
}

} // namespace welcomer::launch
