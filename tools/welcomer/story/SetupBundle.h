// The setup application's bundle, for the commands that do its work.

#pragma once

#include "platform/ResourceBundle.h"
#include "tools/welcomer/cli/Tool.h"

#include <memory>
#include <string>

namespace welcomer::tool {

// Where the bundle is expected below a root that was given.
inline constexpr const char* kSetupBundlePath = "/usr/share/welcomer/setup-bundle";

// Gives a command the option `--bundle`.
void addBundleOption(CommandLevel command, std::string& bundle);

// Opens the bundle that `--bundle` names, or without it the one that comes with the tool; below a root that
// was given, the one at the path above. Throws CommandFailure where there is none.
std::unique_ptr<platform::ResourceBundle> openSetupBundle(const Options& options, const std::string& bundle);

// A path of the system that was given on the command line, as it stays whatever the working folder is.
//  option  its name, for the user
// Throws UsageError for one below --root that is not absolute.
std::string systemPath(const Options& options, const char* option, const std::string& path);

} // namespace welcomer::tool
