#include "tools/welcomer/terminal/TextTable.h"

#include "tools/welcomer/terminal/Printable.h"

#include <algorithm>
#include <cassert>
#include <ostream>
#include <utility>

namespace welcomer::tool {

TextTable::TextTable(std::vector<std::string> header, std::string indent) : _indent(std::move(indent)) {
    _lines.push_back(std::move(header));
}

void TextTable::addRow(const std::vector<std::string>& cells) {
    assert(cells.size() == _lines.front().size());
    std::vector<std::string>& line = _lines.emplace_back();
    std::transform(cells.begin(), cells.end(), std::back_inserter(line), printable);
}

void TextTable::print(std::ostream& out) const {
    std::vector<std::size_t> widths(_lines.front().size());
    for (const auto& line : _lines) {
        for (std::size_t i = 0; i < line.size(); ++i) {
            widths[i] = std::max(widths[i], columns(line[i]));
        }
    }
    for (const auto& line : _lines) {
        out << _indent;
        for (std::size_t i = 0; i < line.size(); ++i) {
            out << line[i];
            if (i + 1 < line.size()) {
                out << std::string(widths[i] - columns(line[i]) + 2, ' ');
            }
        }
        out << '\n';
    }
}

} // namespace welcomer::tool
