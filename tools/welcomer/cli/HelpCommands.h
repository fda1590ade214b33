// The commands about the command line itself: help, and what pages and completions are made with.

#pragma once

#include "tools/welcomer/cli/Tool.h"

namespace welcomer::tool {

// Adds `help`, and two that its list does not show: `list-values`, which completions ask, and `write-help`, which
// the build runs.
//  app  the whole command line; borrowed until the chosen command has run
void addHelpCommands(CLI::App& app, CommandLine& commandLine);

} // namespace welcomer::tool
