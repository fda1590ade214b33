#include "backends/local/LocalSystemLog.h"

#include <algorithm>
#include <exception>
#include <string_view>

namespace welcomer::local {

namespace {

constexpr std::string_view kEllipsis = "…";

std::string withVisibleNulls(std::string_view message) {
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

bool isContinuation(char byte) {
    return (static_cast<unsigned char>(byte) & 0xc0) == 0x80;
}

// Cuts a text that is too long where a character begins, as far as it has characters.
void cut(std::string& text) {
    constexpr std::size_t kLongestCharacter = 4;
    if (text.size() <= kMaximumLogMessage) {
        return;
    }
    std::size_t end = kMaximumLogMessage - kEllipsis.size();
    const std::size_t earliest = end - kLongestCharacter;
    while (end > earliest && isContinuation(text[end])) {
        --end;
    }
    text.resize(end);
    text += kEllipsis;
}

} // namespace

void LocalSystemLog::write(int priority, const std::string& message) {
    if (message.size() <= kMaximumLogMessage && message.find('\0') == std::string::npos) {
        _connection.send(priority, message);
        return;
    }
    try {
        // No byte becomes less than one.
        std::string text = withVisibleNulls(std::string_view(message).substr(0, kMaximumLogMessage + 1));
        cut(text);
        _connection.send(priority, text);
    } catch (const std::exception&) {
        // No memory for another copy: the text up to the first NUL has to do.
        const std::string_view text(message);
        _connection.send(priority, text.substr(0, std::min(text.find('\0'), kMaximumLogMessage)));
    }
}

} // namespace welcomer::local
