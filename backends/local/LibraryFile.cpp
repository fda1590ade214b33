#include "backends/local/LibraryFile.h"

#include "backends/posix/FileDescriptor.h"
#include "backends/posix/Strangers.h"
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
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

namespace welcomer::local {

namespace {

using Header = ElfW(Ehdr);
using Segment = ElfW(Phdr);

constexpr unsigned char kNativeClass = sizeof(void*) == 8 ? ELFCLASS64 : ELFCLASS32;

bool readAt(int file, void* bytes, std::size_t size, std::uint64_t offset) {
    return offset <= INT64_MAX &&
           ::pread(file, bytes, size, static_cast<off_t>(offset)) == static_cast<ssize_t>(size);
}

// Where a part of a file ends; one that no file can hold ends behind every file.
std::uint64_t endOf(std::uint64_t offset, std::uint64_t size) {
    std::uint64_t end = 0;
    return __builtin_add_overflow(offset, size, &end) ? UINT64_MAX : end;
}

// How long a library's file is by its own account: its segments, and the table of its sections, which linkers write
// last. None for what is no library of this kind of machine.
std::optional<std::uint64_t> lengthByItsHeaders(int file) {
    Header header{};
    if (!readAt(file, &header, sizeof header, 0) || std::memcmp(header.e_ident, ELFMAG, SELFMAG) != 0 ||
        header.e_ident[EI_CLASS] != kNativeClass || header.e_phentsize != sizeof(Segment)) {
        return std::nullopt;
    }
    std::uint64_t length = endOf(header.e_shoff, std::uint64_t{header.e_shentsize} * header.e_shnum);
    std::vector<Segment> segments(header.e_phnum);
    const std::size_t size = segments.size() * sizeof(Segment);
    if (!readAt(file, segments.data(), size, header.e_phoff)) {
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

std::string reasonNotToLoad(const posix::RootFolder& root, const std::string& path) {
    // In a folder with a sticky bit a library is safe, but whoever may write there may add to it.
    for (const std::string& each : {posix::splitPath(path).folder, path}) {
        if (std::string stranger = posix::strangerWhoMayChange(root, each, true); !stranger.empty()) {
            return stranger;
        }
    }
    const std::string shown = root.shown(path);
    const posix::FileDescriptor file = root.open(path, O_RDONLY | O_NONBLOCK | O_NOCTTY);
    struct stat status = {};
    if (!file || ::fstat(file.get(), &status) != 0) {
        return posix::systemError("cannot load " + shown, errno).message;
    }
    return S_ISREG(status.st_mode) ? reasonInContent(file.get(), status, shown)
                                   : shown + " is no regular file";
}

} // namespace welcomer::local
