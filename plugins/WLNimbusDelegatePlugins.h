// Finding, loading and checking the delegate plug-ins, once per process.

#pragma once

#include "platform/PluginDirectory.h"
#include "plugins/WLFirstRunDelegateConfiguration.h"

#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {

// Where the plug-ins are, and what the names of their entries end in (compared case-sensitively).
using platform::kPluginDirectory;
inline constexpr char kPluginExtension[] = "ncdplugin";

using DelegatePluginArray = std::vector<std::shared_ptr<WLFirstRunDelegateConfiguration>>;

// The plug-ins of this machine, one per identifier, in the order in which they were met. The first call scans
// the plug-in directory; every later call returns the same array, even when it is empty. It lives until the
// process ends. Any thread, which has its run loop before the first plug-in is loaded; the first scan is made
// once.
const DelegatePluginArray& WLNimbusDelegatePlugins();

// What became of one entry of the plug-in directory.
struct PluginScanEntry {
    std::string fileName;
    std::optional<std::string> identifier;                   // none when it was not learnt
    std::shared_ptr<WLFirstRunDelegateConfiguration> plugin; // null when the entry was skipped
    std::string reason;                                      // why it was skipped, one line for people
};

// Scans the plug-in directory anew, with a log line for every entry that is skipped; WLNimbusDelegatePlugins
// stands on it. Any thread.
std::vector<PluginScanEntry> scanDelegatePlugins();

} // namespace welcomer
