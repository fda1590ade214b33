#include "tools/welcomer/terminal/TextTable.h"

#include "tools/welcomer/terminal/Printable.h"

#include <algorithm>
#include <cassert>
#include <numeric>
#include <ostream>
#include <utility>

namespace welcomer::tool {

namespace {

constexpr std::size_t kBetween = 2; // columns between two cells

} // namespace

TextTable::TextTable(std::vector<std::string> header, std::string indent) : _indent(std::move(indent)) {
    _lines.push_back(std::move(header));
}

void TextTable::addRow(const std::vector<std::string>& cells) {
    assert(cells.size() == _lines.front().size());
    std::vector<std::string>& line = _lines.emplace_back();
    std::transform(cells.begin(), cells.end(), std::back_inserter(line), printable);
}

void TextTable::print(std::ostream& out, std::optional<std::size_t> width) const {
    const std::vector<std::size_t> widths = _widths(width);
    for (const auto& line : _lines) {
        out << _indent;
        for (std::size_t i = 0; i < line.size(); ++i) {
            const std::string cell = cutTo(line[i], widths[i]);
            out << cell;
            if (i + 1 < line.size()) {
                out << std::string(widths[i] - columns(cell) + kBetween, ' ');
            }
        }
        out << '\n';
    }
}

// Of each column. A terminal that is narrower than the headings gets lines that wrap.
std::vector<std::size_t> TextTable::_widths(std::optional<std::size_t> width) const {
    std::vector<std::size_t> widths(_lines.front().size());
    for (const auto& line : _lines) {
        for (std::size_t i = 0; i < line.size(); ++i) {
            widths[i] = std::max(widths[i], columns(line[i]));
        }
    }
    std::size_t total =
        std::accumulate(widths.begin(), widths.end(), _indent.size() + kBetween * (widths.size() - 1));
    while (width && total > *width) {
        std::size_t widest = widths.size();
        for (std::size_t i = 0; i < widths.size(); ++i) {
            const bool canShrink = widths[i] > columns(_lines.front()[i]);
            if (canShrink && (widest == widths.size() || widths[i] > widths[widest])) {
                widest = i;
            }
        }
        if (widest == widths.size()) {
            break;
        }
        --widths[widest];
        --total;
    }
    return widths;
}

} // namespace welcomer::tool
