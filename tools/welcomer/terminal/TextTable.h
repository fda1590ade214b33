// A table for people: columns as wide as their widest cell, two spaces between them.

#pragma once

#include <iosfwd>
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
    void print(std::ostream& out) const;

  private:
    std::string _indent;
    std::vector<std::vector<std::string>> _lines;
};

} // namespace welcomer::tool
