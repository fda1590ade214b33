#include "tools/welcomer/terminal/TextTable.h"

#include <gtest/gtest.h>
#include <optional>
#include <sstream>

namespace welcomer::tool {
namespace {

std::string printed(const TextTable& table, std::optional<std::size_t> width = std::nullopt) {
    std::ostringstream out;
    table.print(out, width);
    return out.str();
}

TEST(TextTable, ColumnsAreAsWideAsTheirWidestCell) {
    TextTable table({"NAME", "STATE"});
    table.addRow({"a", "loaded"});
    table.addRow({"longer", "x"});
    EXPECT_EQ(printed(table), "NAME    STATE\n"
                              "a       loaded\n"
                              "longer  x\n");
}

TEST(TextTable, CharactersBeyondAsciiStayInLine) {
    TextTable table({"A", "B"}, "  ");
    table.addRow({"äöü", "1"});
    EXPECT_EQ(printed(table), "  A    B\n  äöü  1\n");
}

TEST(TextTable, ACellCannotEndItsLine) {
    TextTable table({"A"});
    table.addRow({"x\ny"});
    EXPECT_EQ(printed(table), "A\nx\\ny\n");
}

TEST(TextTable, OnATerminalTheWidestCellsAreCutUntilALineFits) {
    TextTable table({"NAME", "FILE"}, " ");
    table.addRow({std::string(5000, 'x'), "file-of-some-length"});
    table.addRow({"anna", "short"});
    EXPECT_EQ(printed(table, 22), " NAME       FILE\n"
                                  " xxxxxxxx…  file-of-s…\n"
                                  " anna       short\n");
    EXPECT_EQ(printed(table, 5022), printed(table)); // just wide enough
    EXPECT_NE(printed(table, 5021), printed(table));
}

TEST(TextTable, WhereNotEvenTheHeadingsFitTheyStayWhole) {
    TextTable table({"NAME", "STATE"});
    table.addRow({"longer than that", "loaded"});
    EXPECT_EQ(printed(table, 3), "NAME  STATE\n"
                                 "lon…  load…\n");
}

TEST(TextTable, WideCharactersTakeTwoColumns) {
    TextTable table({"A", "B"});
    table.addRow({"東京", "1"});
    table.addRow({"abc", "2"});
    EXPECT_EQ(printed(table), "A     B\n"
                              "東京  1\n"
                              "abc   2\n");
    EXPECT_EQ(printed(table, 6), "A    B\n"
                                 "東…  1\n"
                                 "abc  2\n");
}

} // namespace
} // namespace welcomer::tool
