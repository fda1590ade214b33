// The registry of the delegate plug-ins with the plug-ins of a test.

#pragma once

#include "plugins/WLNimbusDelegatePlugins.h"

#include <utility>

namespace welcomer::fakes {

// Puts these in the place of what a scan of the installed platform found. Main thread.
inline void fillPluginRegistry(DelegatePluginArray plugins) {
    // The registry's own array is no constant, only what it hands out.
    const_cast<DelegatePluginArray&>(WLNimbusDelegatePlugins()) = std::move(plugins);
}

} // namespace welcomer::fakes
