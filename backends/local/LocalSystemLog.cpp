#include "backends/local/LocalSystemLog.h"

#include <exception>
#include <syslog.h>

namespace welcomer::local {

namespace {

std::string withVisibleNulls(const std::string& message) {
    std::string text;
    for (const char character : message) {
        if (character == '\0') {
            text += "\\0";
        } else {
            text += character;
        }
    }
    return text;
}

} // namespace

void LocalSystemLog::write(int priority, const std::string& message) {
    if (message.find('\0') == std::string::npos) {
        ::syslog(priority, "%s", message.c_str());
        return;
    }
    try {
        ::syslog(priority, "%s", withVisibleNulls(message).c_str());
    } catch (const std::exception&) {
        // No memory for another copy: the text up to the first NUL has to do.
        ::syslog(priority, "%s", message.c_str());
    }
}

} // namespace welcomer::local
