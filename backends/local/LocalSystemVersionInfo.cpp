#include "backends/local/LocalSystemVersionInfo.h"

#include <cstddef>
#include <string_view>

namespace welcomer::local {

namespace {

// A value as a shell reads it: within quotes of either kind, and with backslashes before characters that
// stand for themselves.
std::string unquoted(std::string_view text) {
    const bool isQuoted =
        text.size() >= 2 && (text.front() == '"' || text.front() == '\'') && text.back() == text.front();
    const bool hasEscapes = !isQuoted || text.front() == '"';
    if (isQuoted) {
        text = text.substr(1, text.size() - 2);
    }
    std::string value;
    for (std::size_t index = 0; index < text.size(); ++index) {
        if (hasEscapes && text[index] == '\\' && index + 1 < text.size()) {
            ++index;
        }
        value += text[index];
    }
    return value;
}

// The line without white space at its end.
std::string_view trimmed(std::string_view line) {
    return line.substr(0, line.find_last_not_of(" \t\r") + 1);
}

} // namespace

std::optional<std::string> LocalSystemVersionInfo::_value(std::string_view assignment) {
    std::optional<std::string> text = _fileSystem.readText("/etc/os-release");
    if (!text) {
        text = _fileSystem.readText("/usr/lib/os-release");
    }
    std::optional<std::string> value; // the last assignment counts
    std::string_view rest = text ? std::string_view(*text) : std::string_view();
    while (!rest.empty()) {
        const std::string_view line = rest.substr(0, rest.find('\n'));
        if (line.starts_with(assignment)) {
            value = unquoted(trimmed(line.substr(assignment.size())));
        }
        rest.remove_prefix(line.size() == rest.size() ? line.size() : line.size() + 1);
    }
    return value && value->empty() ? std::nullopt : value;
}

} // namespace welcomer::local
