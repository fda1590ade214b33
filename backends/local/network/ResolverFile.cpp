#include "backends/local/network/ResolverFile.h"

#include "backends/posix/AtomicFile.h"
#include "backends/posix/Directory.h"
#include "backends/posix/FileContent.h"
#include "backends/posix/FileDescriptor.h"
#include "backends/posix/FileLock.h"
#include "backends/posix/SystemError.h"
#include "platform/FileSystem.h"
#include "platform/NetworkConfigStore.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace welcomer::local {

namespace {

constexpr char kFolder[] = "/etc";
constexpr char kName[] = "resolv.conf";
constexpr char kPath[] = "/etc/resolv.conf";
constexpr mode_t kMode = 0644;
constexpr char kLocksParent[] = "/var/lib/welcomer";
constexpr mode_t kLocksParentMode = 0755;
constexpr mode_t kPermissions = 07777;
// What the machine's resolver may be a link to, absolute or relative, where that is systemd-resolved.
constexpr std::array<std::string_view, 4> kResolvedFiles = {
    "/run/systemd/resolve/stub-resolv.conf", "/run/systemd/resolve/resolv.conf",
    "/usr/lib/systemd/resolv.conf", "/lib/systemd/resolv.conf"};
constexpr std::string_view kBlanks = " \t\r";
constexpr std::string_view kServer = "nameserver";

// Takes the first line, its end with it, from a text.
std::string_view takeLine(std::string_view& text) {
    const std::size_t end = text.find('\n');
    const std::string_view line = text.substr(0, end == std::string_view::npos ? end : end + 1);
    text.remove_prefix(line.size());
    return line;
}

// What a line says behind a keyword, which stands at its start; none for another line.
std::optional<std::string_view> behind(std::string_view keyword, std::string_view line) {
    if (!line.starts_with(keyword)) {
        return std::nullopt;
    }
    line.remove_prefix(keyword.size());
    if (line.empty() || kBlanks.find(line.front()) == std::string_view::npos) {
        return std::nullopt;
    }
    return line;
}

// The first word; empty when there is none or it is no printable ASCII.
std::string firstWord(std::string_view text) {
    text.remove_prefix(std::min(text.find_first_not_of(kBlanks), text.size()));
    const std::string_view word = text.substr(0, text.find_first_of(" \t\r\n"));
    const bool isPrintable = std::ranges::all_of(word, [](char each) { return each > ' ' && each < 127; });
    return isPrintable ? std::string(word) : std::string();
}

} // namespace

ResolverConfiguration readResolverText(std::string_view text) {
    ResolverConfiguration configuration;
    while (!text.empty()) {
        const std::string_view line = takeLine(text);
        if (const auto server = behind(kServer, line)) {
            std::string address = firstWord(*server);
            if (!address.empty()) {
                configuration.servers.push_back(std::move(address));
            }
            continue;
        }
        const auto search = behind("search", line);
        const auto domain = search ? search : behind("domain", line);
        std::string name = domain ? firstWord(*domain) : std::string();
        if (!name.empty()) {
            configuration.domain = std::move(name);
        }
    }
    return configuration;
}

std::string replaceResolverServers(std::string_view text, const std::vector<std::string>& servers) {
    std::string result;
    bool isWritten = false;
    const auto write = [&] {
        for (const std::string& server : servers) {
            result.append(kServer).append(" ").append(server).append("\n");
        }
        isWritten = true;
    };
    while (!text.empty()) {
        const std::string_view line = takeLine(text);
        if (!behind(kServer, line)) {
            result += line;
        } else if (!isWritten) {
            write();
        }
    }
    if (!isWritten) {
        if (!result.empty() && !result.ends_with('\n')) {
            result += '\n';
        }
        write();
    }
    return result;
}

ResolverConfiguration ResolverFile::read() const {
    std::string text;
    if (posix::readFile(_root, kPath, text, platform::kMaximumTextSize) != 0) {
        return {};
    }
    return readResolverText(text);
}

bool ResolverFile::isOfResolved() const {
    const posix::FileDescriptor folder = _root.open(kFolder, O_RDONLY | O_DIRECTORY);
    std::array<char, PATH_MAX> buffer = {};
    const ssize_t size = ::readlinkat(folder.get(), kName, buffer.data(), buffer.size());
    const std::string_view target(buffer.data(), size < 0 ? 0 : static_cast<std::size_t>(size));
    return std::ranges::any_of(kResolvedFiles, [&](std::string_view each) { return target.ends_with(each); });
}

std::int32_t ResolverFile::writeServers(const std::vector<std::string>& servers, std::string& detail) const {
    detail = _root.shown(kPath);
    const posix::FileDescriptor folder = _root.open(kFolder, O_RDONLY | O_DIRECTORY);
    if (!folder) {
        return platform::kNetworkConfigNameServersNotWritten;
    }
    posix::makeDirectories(_root, kLocksParent, kLocksParentMode);
    const posix::FileLock lock(_root, posix::machineLockPath(kName));
    if (!lock) {
        detail = lock.error().message;
        return lock.error().number == ETIMEDOUT ? platform::kNetworkConfigInUse
                                                : platform::kNetworkConfigNameServersNotWritten;
    }
    struct stat status = {};
    const bool isThere = ::fstatat(folder.get(), kName, &status, AT_SYMLINK_NOFOLLOW) == 0;
    if (isThere && S_ISLNK(status.st_mode)) {
        return platform::kNetworkConfigNameServersElsewhere;
    }
    std::string text;
    const int error = posix::readFile(_root, kPath, text, platform::kMaximumTextSize);
    if (error != 0 && error != ENOENT) {
        detail = posix::systemError("cannot read " + detail, error).message;
        return platform::kNetworkConfigNameServersNotWritten;
    }
    const std::string changed = replaceResolverServers(error == 0 ? text : std::string(), servers);
    const mode_t mode = isThere ? status.st_mode & kPermissions : kMode;
    const int written = error == 0 && changed == text ? 0
                                                      : posix::replaceFile(folder.get(), kName, changed, mode,
                                                                           posix::AfterCrash::OldOrNew);
    if (written != 0) {
        detail = posix::systemError("cannot write " + detail, written).message;
        return platform::kNetworkConfigNameServersNotWritten;
    }
    return platform::kNetworkConfigSuccess;
}

} // namespace welcomer::local
