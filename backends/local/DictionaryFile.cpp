#include "backends/local/DictionaryFile.h"

#include "backends/posix/AtomicFile.h"
#include "backends/posix/Directory.h"
#include "backends/posix/FileContent.h"
#include "backends/posix/SystemError.h"
#include "platform/Path.h"
#include "propertylist/PropertyListReader.h"
#include "propertylist/PropertyListWriter.h"
#include "propertylist/UnwritableValue.h"

#include <cerrno>
#include <fcntl.h>
#include <optional>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>
#include <utility>

namespace welcomer::local {

namespace {

using State = DictionaryFileContent::State;

// More than any program keeps in its preferences.
constexpr std::size_t kMaximumFileSize = std::size_t{16} * 1024 * 1024;
constexpr mode_t kPermissions = 07777;

constexpr char kDamagedSuffix[] = ".damaged";
constexpr int kMaximumDamagedFiles = 1000;

// "name.damaged", "name.damaged-2", "name.damaged-3" and so on.
std::string damagedName(const std::string& name, int number) {
    return name + kDamagedSuffix + (number == 1 ? std::string() : "-" + std::to_string(number));
}

// Takes the content from its bytes.
void parse(DictionaryFileContent& content) {
    content.state = State::Whole;
    content.values.clear();
    content.reason.clear();
    if (content.bytes.empty()) {
        return;
    }
    PropertyListReadResult result = readPropertyList(content.bytes);
    PropertyList::Dictionary* values = result ? result.value->dictionary() : nullptr;
    if (values) {
        content.values = std::move(*values);
    } else {
        content.state = State::Damaged;
        content.reason = result ? "a property list, but no dictionary" : std::move(result.error);
    }
}

} // namespace

DictionaryFileContent readDictionaryFile(const posix::RootFolder& root, const std::string& path) {
    DictionaryFileContent content;
    rereadDictionaryFile(root, path, content);
    return content;
}

void rereadDictionaryFile(const posix::RootFolder& root, const std::string& path,
                          DictionaryFileContent& content) {
    std::string& bytes = content.otherBytes;
    const int error = posix::readFile(root, path, bytes, kMaximumFileSize);
    if (error != 0 && error != ENOENT) {
        content = {State::Unreadable, {}, {}, std::generic_category().message(error)};
        return;
    }
    if (error == ENOENT) {
        bytes.clear();
    }
    if (content.state == State::Unreadable || bytes != content.bytes) {
        content.bytes.swap(bytes);
        parse(content);
    }
}

LockedDictionaryFolder::LockedDictionaryFolder(const posix::RootFolder& root, const std::string& path,
                                               const std::string& lockPath, mode_t folderMode,
                                               mode_t fileMode)
    : _shownPath(root.shown(path)),
      _fileMode(fileMode) {
    posix::makeDirectory(root, path, folderMode); // fails where it exists already; opening says the rest
    _folder = root.open(path, O_RDONLY | O_DIRECTORY);
    if (!_folder) {
        _error = posix::systemError("cannot write to " + _shownPath, errno);
        return;
    }
    _lock = posix::FileLock(root, lockPath);
    _error = _lock.error();
}

std::optional<std::string> LockedDictionaryFolder::write(const std::string& name,
                                                         const PropertyList::Dictionary& values) {
    std::optional<std::string> bytes = writeXMLPropertyList(values);
    if (!bytes) {
        _error = {0, "cannot write " + _shown(name) + ": " +
                         findUnwritableValue(values).value_or("it would hold a value that XML cannot hold")};
        return std::nullopt;
    }
    struct stat present = {};
    const bool isPresent = ::fstatat(_folder.get(), name.c_str(), &present, 0) == 0;
    const mode_t mode = isPresent ? present.st_mode & kPermissions : _fileMode;
    // Syncing the folder too would take as long again, for a change that nothing else relies on.
    if (const int error =
            posix::replaceFile(_folder.get(), name, *bytes, mode, posix::AfterCrash::OldOrNew)) {
        _error = posix::systemError("cannot write " + _shown(name), error);
        bytes.reset();
    }
    return bytes;
}

std::string LockedDictionaryFolder::setAside(const std::string& name, const std::string& bytes) {
    for (int number = 1; number <= kMaximumDamagedFiles; ++number) {
        std::string other = damagedName(name, number);
        // An empty file of our own takes the name, so that nothing else is overwritten.
        const posix::FileDescriptor reserved(
            ::openat(_folder.get(), other.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, _fileMode));
        if (!reserved && errno == EEXIST) {
            continue;
        }
        if (!reserved) {
            break;
        }
        if (::renameat(_folder.get(), name.c_str(), _folder.get(), other.c_str()) == 0 ||
            (errno == EBUSY && _moveContent(name, reserved.get(), bytes))) {
            return other;
        }
        _error = posix::systemError("cannot set " + _shown(name) + " aside, which is damaged", errno);
        ::unlinkat(_folder.get(), other.c_str(), 0);
        return {};
    }
    _error = posix::systemError("cannot set " + _shown(name) + " aside, which is damaged", errno);
    return {};
}

std::string LockedDictionaryFolder::_shown(const std::string& name) const {
    return platform::joinPath(_shownPath, name);
}

bool LockedDictionaryFolder::_moveContent(const std::string& name, int destination,
                                          const std::string& bytes) const {
    if (posix::writeAll(destination, bytes) != 0 || ::fsync(destination) != 0) {
        return false;
    }
    return static_cast<bool>(
        posix::FileDescriptor(::openat(_folder.get(), name.c_str(), O_WRONLY | O_TRUNC | O_CLOEXEC)));
}

} // namespace welcomer::local
