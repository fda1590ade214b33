#include "tools/welcomer/story/TemporaryFolder.h"

#include "tools/welcomer/terminal/Failure.h"

#include <cerrno>
#include <cstdlib>
#include <string>
#include <system_error>

namespace welcomer::tool {

TemporaryFolder::TemporaryFolder() {
    const char* const folder = std::getenv("TMPDIR");
    std::string name =
        (std::filesystem::path(folder && *folder != '\0' ? folder : "/tmp") / "welcomer-try.XXXXXX").string();
    if (!mkdtemp(name.data())) {
        const int number = errno;
        throw CommandFailure("cannot make a temporary folder in " +
                             std::filesystem::path(name).parent_path().string() + ": " +
                             std::generic_category().message(number));
    }
    _path = name;
}

TemporaryFolder::~TemporaryFolder() {
    std::error_code ignored; // nothing better can be done with it here
    std::filesystem::remove_all(_path, ignored);
}

} // namespace welcomer::tool
