#include "backends/posix/FileContent.h"

#include "backends/posix/FileDescriptor.h"

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <fcntl.h>
#include <sys/stat.h>

namespace welcomer::posix {

namespace {

constexpr std::size_t kSmallestRead = 4096;

// Reads an open file whose status is known.
int readRest(int descriptor, const struct stat& status, std::string& content, std::size_t maximum) {
    if (status.st_size > 0 && static_cast<std::uintmax_t>(status.st_size) > maximum) {
        return EFBIG; // a sparse file may claim more than there is memory for
    }
    // Files that give no size, as those of procfs, grow the buffer.
    const auto expected = static_cast<std::size_t>(status.st_size);
    std::size_t length = 0;
    content.resize(expected > 0 ? expected + 1 : kSmallestRead);
    while (true) {
        const ssize_t count = ::read(descriptor, content.data() + length, content.size() - length);
        if (count < 0 && errno == EINTR) {
            continue;
        }
        if (count < 0) {
            return errno;
        }
        length += static_cast<std::size_t>(count);
        if (length > maximum) {
            return EFBIG;
        }
        // A regular file that ended where it should, although there was room for more, has no more to give.
        if (count == 0 || (S_ISREG(status.st_mode) && length == expected && length < content.size())) {
            content.resize(length);
            return 0;
        }
        if (length == content.size()) {
            content.resize(2 * length);
        }
    }
}

} // namespace

int readAll(int descriptor, std::string& content, std::size_t maximum) {
    struct stat status = {};
    return ::fstat(descriptor, &status) == 0 ? readRest(descriptor, status, content, maximum) : errno;
}

int readFile(const RootFolder& root, const std::string& path, std::string& content, std::size_t maximum) {
    const FileDescriptor file = root.open(path, O_RDONLY | O_NONBLOCK);
    struct stat status = {};
    if (!file || ::fstat(file.get(), &status) != 0) {
        return errno;
    }
    return S_ISREG(status.st_mode) ? readRest(file.get(), status, content, maximum) : EINVAL;
}

int writeAll(int descriptor, std::string_view content) {
    while (!content.empty()) {
        const ssize_t count = ::write(descriptor, content.data(), content.size());
        if (count < 0 && errno != EINTR) {
            return errno;
        }
        content.remove_prefix(static_cast<std::size_t>(std::max<ssize_t>(count, 0)));
    }
    return 0;
}

} // namespace welcomer::posix
