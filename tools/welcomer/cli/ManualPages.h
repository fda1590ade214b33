// Manual pages of the command line, in the language of scdoc.

#pragma once

#include "tools/welcomer/cli/Definition.h"

#include <string>

namespace welcomer::tool {

// The name of a command's page, without its section: "welcomer-replay".
std::string pageName(const CommandDefinition& command);

// The page of the program, which names the commands, or that of one of its commands with all that are below it.
//  program  the whole command line
//  page     the program, or one of its commands
//  more     sections that are written by hand, in the same language; they stand before the last one. May be
//           empty
std::string manualPage(const CommandDefinition& program, const CommandDefinition& page,
                       const std::string& more);

} // namespace welcomer::tool
