#include "backends/local/Directory.h"

#include <cerrno>
#include <sys/stat.h>
#include <unistd.h>

namespace welcomer::local {

int makeDirectory(const std::string& path, mode_t mode) {
    if (::mkdir(path.c_str(), mode) != 0) {
        return errno;
    }
    if (::chmod(path.c_str(), mode) != 0) {
        const int error = errno;
        ::rmdir(path.c_str());
        return error;
    }
    return 0;
}

} // namespace welcomer::local
