#include "tools/welcomer/cli/HelpText.h"

#include <algorithm>
#include <sstream>

namespace welcomer::tool {

namespace {

constexpr std::size_t kLeastRoom = 24;  // columns; with less a description is not worth its own
constexpr std::size_t kSmallIndent = 8; // columns, instead
constexpr std::size_t kLeastWidth = 20; // columns; nothing is broken for less
constexpr std::size_t kTextIndent = 2;  // columns, of what goes on and is no description

// How far a line's second and later parts stand in.
std::size_t indentOf(const std::string& line, std::size_t width) {
    if (!line.starts_with("  ")) {
        return kTextIndent;
    }
    return width >= kHelpColumn + kLeastRoom ? kHelpColumn : kSmallIndent;
}

void wrapLine(std::ostream& out, std::string line, std::size_t width) {
    const std::size_t indent = indentOf(line, width);
    while (line.size() > width) {
        std::size_t end = line.rfind(' ', width);
        const std::size_t start = line.find_first_not_of(' ');
        if (end == std::string::npos || end <= start) {
            end = line.find(' ', std::max(start, width)); // a word that fits nowhere
        }
        if (end == std::string::npos) {
            break;
        }
        const std::size_t last = line.find_last_not_of(' ', end);
        out << line.substr(0, last + 1) << '\n';
        const std::size_t next = line.find_first_not_of(' ', end);
        if (next == std::string::npos) {
            return;
        }
        line = std::string(indent, ' ') + line.substr(next);
    }
    out << line << '\n';
}

} // namespace

std::string wrapHelp(const std::string& text, std::optional<std::size_t> width) {
    if (!width || *width < kLeastWidth) {
        return text;
    }
    std::istringstream lines(text);
    std::ostringstream out;
    for (std::string line; std::getline(lines, line);) {
        wrapLine(out, std::move(line), *width);
    }
    return out.str();
}

} // namespace welcomer::tool
