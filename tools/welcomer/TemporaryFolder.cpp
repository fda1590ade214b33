#include "tools/welcomer/TemporaryFolder.h"

#include "tools/welcomer/Tool.h"

#include <cerrno>
#include <cstdlib>
#include <system_error>

namespace welcomer::tool {

TemporaryFolder::TemporaryFolder() {
    std::string name = (std::filesystem::temp_directory_path() / "welcomer-try.XXXXXX").string();
    if (!mkdtemp(name.data())) {
        throw CommandFailure("cannot make a temporary folder: " + std::generic_category().message(errno));
    }
    _path = name;
}

TemporaryFolder::~TemporaryFolder() {
    std::error_code ignored; // nothing better can be done with it here
    std::filesystem::remove_all(_path, ignored);
}

} // namespace welcomer::tool
