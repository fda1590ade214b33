#include "tools/welcomer/story/FolderCopy.h"

#include "tools/welcomer/terminal/Failure.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/sendfile.h>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>

namespace welcomer::tool {

namespace {

namespace fs = std::filesystem;

constexpr mode_t kPermissions = 0777;

[[noreturn]] void fail(const std::string& what, const fs::path& path, const std::error_code& reason) {
    throw CommandFailure("cannot " + what + " " + path.string() + ": " + reason.message());
}

[[noreturn]] void fail(const std::string& what, const fs::path& path) {
    fail(what, path, {errno, std::generic_category()});
}

class OpenFile {
  public:
    OpenFile(const fs::path& path, int flags, mode_t mode, const char* purpose)
        : _file(::open(path.c_str(), flags | O_CLOEXEC, mode)) {
        if (_file < 0) {
            fail(purpose, path);
        }
    }
    ~OpenFile() { ::close(_file); }
    OpenFile(const OpenFile&) = delete;
    OpenFile& operator=(const OpenFile&) = delete;

    int get() const { return _file; }

  private:
    const int _file;
};

void copyFile(const fs::path& source, const fs::path& destination) {
    constexpr std::size_t kPiece = std::size_t{1} << 30U;
    const OpenFile from(source, O_RDONLY, 0, "read");
    struct stat status = {};
    if (::fstat(from.get(), &status) != 0) {
        fail("read", source);
    }
    const OpenFile to(destination, O_WRONLY | O_CREAT | O_TRUNC, status.st_mode & kPermissions, "write");
    ssize_t count = 0;
    do {
        count = ::sendfile(to.get(), from.get(), nullptr, kPiece);
    } while (count > 0 || (count < 0 && errno == EINTR));
    if (count < 0) {
        fail("write", destination);
    }
}

} // namespace

bool makeFolders(const fs::path& folder) {
    std::error_code error;
    const bool wasMissing = fs::create_directories(folder, error);
    if (error) {
        fail("make the folder", folder, error);
    }
    return wasMissing;
}

void copyTree(const fs::path& source, const fs::path& destination) {
    if (!fs::is_directory(source)) {
        copyFile(source, destination);
        return;
    }
    makeFolders(destination);
    std::error_code error;
    for (const auto& entry : fs::directory_iterator(source, error)) {
        copyTree(entry.path(), destination / entry.path().filename());
    }
    if (error) {
        fail("read", source, error);
    }
}

} // namespace welcomer::tool
