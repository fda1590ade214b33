// Finding, loading and checking the delegate plug-ins, once per process.

#pragma once

#include "platform/PluginDirectory.h"
#include "plugins/WLFirstRunDelegateConfiguration.h"

#include <functional>
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
//  isWanted  asked before each entry is loaded, with its file's name: one that is not wanted is left out; null for all
std::vector<PluginScanEntry>
scanDelegatePlugins(const std::function<bool(const std::string& fileName)>& isWanted = nullptr);

} // namespace welcomer
