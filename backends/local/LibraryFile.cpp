#include "backends/local/LibraryFile.h"

#include "backends/posix/SystemError.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstdint>
#include <cstring>
#include <elf.h>
#include <fcntl.h>
#include <link.h>
#include <optional>
#include <unistd.h>
#include <utility>
#include <vector>

namespace welcomer::local {

namespace {

using Header = ElfW(Ehdr);
using Segment = ElfW(Phdr);

constexpr unsigned char kNativeClass = sizeof(void*) == 8 ? ELFCLASS64 : ELFCLASS32;

// A file that is read from its beginning on, where linkers put what is wanted here: in one go, mostly.
class Content {
  public:
    explicit Content(int file) : _file(file), _size(::pread(file, _beginning.data(), _beginning.size(), 0)) {}

    bool readAt(void* bytes, std::size_t size, std::uint64_t offset) const {
        const std::uint64_t known = _size < 0 ? 0 : static_cast<std::uint64_t>(_size);
        if (offset <= known && size <= known - offset) {
            std::memcpy(bytes, _beginning.data() + offset, size);
            return true;
        }
        return offset <= INT64_MAX &&
               ::pread(_file, bytes, size, static_cast<off_t>(offset)) == static_cast<ssize_t>(size);
    }

  private:
    const int _file;
    std::array<char, 1024> _beginning;
    const ssize_t _size;
};

// Where a part of a file ends; one that no file can hold ends behind every file.
std::uint64_t endOf(std::uint64_t offset, std::uint64_t size) {
    std::uint64_t end = 0;
    return __builtin_add_overflow(offset, size, &end) ? UINT64_MAX : end;
}

// How long a library's file is by its own account: its segments, and the table of its sections, which linkers write
// last. None for what is no library of this kind of machine.
std::optional<std::uint64_t> lengthByItsHeaders(int file) {
    const Content content(file);
    Header header{};
    if (!content.readAt(&header, sizeof header, 0) || std::memcmp(header.e_ident, ELFMAG, SELFMAG) != 0 ||
        header.e_ident[EI_CLASS] != kNativeClass || header.e_phentsize != sizeof(Segment)) {
        return std::nullopt;
    }
    std::uint64_t length = endOf(header.e_shoff, std::uint64_t{header.e_shentsize} * header.e_shnum);
    std::vector<Segment> segments(header.e_phnum);
    const std::size_t size = segments.size() * sizeof(Segment);
    if (!content.readAt(segments.data(), size, header.e_phoff)) {
        return std::max(length, endOf(header.e_phoff, size));
    }
    for (const Segment& segment : segments) {
        if (segment.p_type == PT_LOAD) {
            length = std::max(length, endOf(segment.p_offset, segment.p_filesz));
        }
    }
    return length;
}

bool isUnchanged(const struct stat& before, const struct stat& after) {
    return before.st_size == after.st_size && before.st_mtim.tv_sec == after.st_mtim.tv_sec &&
           before.st_mtim.tv_nsec == after.st_mtim.tv_nsec;
}

// Whether all of the file is there.
std::string reasonInContent(int file, const struct stat& before, const std::string& shown) {
    const auto length = lengthByItsHeaders(file);
    struct stat after = {};
    if (::fstat(file, &after) != 0 || !isUnchanged(before, after)) {
        return shown + " is being changed";
    }
    const auto size = static_cast<std::uint64_t>(before.st_size);
    return length && *length > size ? shown + " is not whole: it has " + std::to_string(size) + " of " +
                                          std::to_string(*length) + " bytes"
                                    : "";
}

} // namespace

LibraryFile::LibraryFile(const posix::RootFolder& root, std::string path)
    : _root(root),
      _path(std::move(path)) {
    constexpr int kFlags = O_RDONLY | O_NONBLOCK | O_NOCTTY;
    _file = root.open(_path, kFlags | O_NOFOLLOW);
    if (!_file && errno == ELOOP) {
        _isLink = true;
        _file = root.open(_path, kFlags);
    }
    if (!_file || ::fstat(_file.get(), &_status) != 0) {
        _error = errno;
    }
}

bool LibraryFile::isFolder() const {
    if (_error == 0) {
        return S_ISDIR(_status.st_mode);
    }
    const posix::FileDescriptor file = _root.open(_path, O_PATH); // one that may only be passed through
    struct stat status = {};
    return file && ::fstat(file.get(), &status) == 0 && S_ISDIR(status.st_mode);
}

std::string LibraryFile::reasonNotToLoad(posix::FolderStrangers& strangers) const {
    const bool isHere = _error == 0 && !_isLink;
    if (std::string stranger = strangers.whoMayChange(_path, isHere ? &_status : nullptr);
        !stranger.empty()) {
        return stranger;
    }
    const std::string shown = _root.shown(_path);
    if (_error != 0) {
        return posix::systemError("cannot load " + shown, _error).message;
    }
    return S_ISREG(_status.st_mode) ? reasonInContent(_file.get(), _status, shown)
                                    : shown + " is no regular file";
}

} // namespace welcomer::local
