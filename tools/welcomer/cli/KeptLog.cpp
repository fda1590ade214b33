#include "tools/welcomer/cli/KeptLog.h"

#include "tools/welcomer/terminal/Printable.h"

#include <iostream>

namespace welcomer::tool {

void KeptLog::write(int, const std::string& message) {
    const std::lock_guard lock(_mutex);
    _last = message;
    if (_verbose) {
        std::cerr << printable(message) << '\n';
    }
}

std::string KeptLog::reason() const {
    const std::lock_guard lock(_mutex);
    return _last.empty() ? "no reason was given" : _last;
}

bool KeptLog::isEmpty() const {
    const std::lock_guard lock(_mutex);
    return _last.empty();
}

} // namespace welcomer::tool
