#include "tools/launch-agents/LoginStamp.h"

#include "log/PCLogManager.h"

#include <cerrno>
#include <fcntl.h>
#include <system_error>
#include <unistd.h>

namespace welcomer::launch {

LoginStamp::LoginStamp(std::string runtimeFolder)
    : _runtimeFolder(std::move(runtimeFolder)),
      _path(_runtimeFolder + "/welcomer-launch-agents") {}

LoginStamp::Result LoginStamp::set() const {
    if (!_runtimeFolder.starts_with('/')) {
        WL_LOG("Launch agents may start more than once: this login has no runtime folder");
        return Result::Impossible;
    }
    const int file = ::open(_path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
    if (file < 0 && errno == EEXIST) {
        return Result::WasThere;
    }
    if (file < 0) {
        WL_LOG("Launch agents may start more than once: failed to create %@: %@", _path,
               std::generic_category().message(errno));
        return Result::Impossible;
    }
    ::close(file);
    return Result::Set;
}

void LoginStamp::remove() const {
    if (_runtimeFolder.starts_with('/')) {
        ::unlink(_path.c_str());
    }
}

} // namespace welcomer::launch
