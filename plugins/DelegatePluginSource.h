// Where the delegate plug-ins come from.

#pragma once

#include "plugins/WLNimbusDelegatePlugins.h"

#include <functional>

namespace welcomer {

// Gives the delegate plug-ins; asked once for each operation, on the calling thread. The array must outlive
// the operation. WLNimbusDelegatePlugins, the registry of this machine, is the default everywhere.
using DelegatePluginSource = std::function<const DelegatePluginArray&()>;

} // namespace welcomer
