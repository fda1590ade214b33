#include "backends/local/DictionaryFileCache.h"

#include <fcntl.h>
#include <sys/stat.h>

namespace welcomer::local {

namespace {

// A file that has just been changed may be changed once more within the same tick of its file system's clock, and
// look as before: that is the coarsest of them.
constexpr std::chrono::seconds kTick{2};

DictionaryFileCache::WallClock::duration sinceEpoch(const timespec& time) {
    return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
}

} // namespace

std::shared_ptr<const DictionaryFileContent> DictionaryFileCache::content(WallClock::time_point now) {
    const std::lock_guard lock(_mutex);
    const std::optional<Version> version = _version();
    if (!version || version != _known) {
        auto read = std::make_shared<DictionaryFileContent>(readDictionaryFile(_root, _path));
        read->bytes = {};
        read->otherBytes = {};
        _content = std::move(read);
        // Looked at before it was read: what is read may be newer than this says, and never older.
        _known = version && now.time_since_epoch() - version->changed > kTick ? version : std::nullopt;
    }
    return _content;
}

std::optional<DictionaryFileCache::Version> DictionaryFileCache::_version() const {
    const posix::FileDescriptor file = _root.open(_path, O_PATH);
    struct stat status = {};
    if (!file || ::fstat(file.get(), &status) != 0) {
        return std::nullopt;
    }
    return Version{status.st_dev, status.st_ino, status.st_size, sinceEpoch(status.st_mtim),
                   sinceEpoch(status.st_ctim)};
}

} // namespace welcomer::local
