// What the shells' completions know of the command line.

#pragma once

#include "tools/welcomer/cli/Definition.h"

#include <set>
#include <string>

namespace welcomer::tool {

// What goes in the place of the line "@TABLES@" in each shell's own part.
//  offered  the names of values that the program lists itself (`list-values NAME`), such as "USER"
// Of the others PLIST and FILE are files, DIR folders, and LOGIN the machine's users.
std::string bashTables(const CommandDefinition& program, const std::set<std::string>& offered);
std::string zshTables(const CommandDefinition& program, const std::set<std::string>& offered);
std::string fishTables(const CommandDefinition& program, const std::set<std::string>& offered);

} // namespace welcomer::tool
