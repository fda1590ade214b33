#include "tools/welcomer/terminal/TextTable.h"

#include <gtest/gtest.h>
#include <sstream>

namespace welcomer::tool {
namespace {

std::string printed(const TextTable& table) {
    std::ostringstream out;
    table.print(out);
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

} // namespace
} // namespace welcomer::tool
