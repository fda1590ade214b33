// A table for people: columns as wide as their widest cell, two spaces between them.

#pragma once

#include <iosfwd>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::tool {

class TextTable {
  public:
    //  indent  stands before each line
    explicit TextTable(std::vector<std::string> header, std::string indent = "");

    // One cell per column; a cell's control characters are shown, not sent to the terminal.
    void addRow(const std::vector<std::string>& cells);

    // Prints the header and the rows.
    //  width  of the terminal that they are to fit on, in columns: the widest cells are cut, down to their
    //  headings' widths; none
    //         where nothing may be lost
    void print(std::ostream& out, std::optional<std::size_t> width = std::nullopt) const;

  private:
    std::vector<std::size_t> _widths(std::optional<std::size_t> width) const;

    std::string _indent;
    std::vector<std::vector<std::string>> _lines;
};

} // namespace welcomer::tool
