// Loadable bundles: code that becomes part of this process.

#pragma once

#include <string>

namespace welcomer::platform {

// A bundle's exported symbol, or why there is none.
struct PluginSymbol {
    const void* address = nullptr; // lives until the process ends: a bundle is never unloaded
    std::string reason;            // one line for people, when the address is null
};

class PluginBundle {
  public:
    virtual ~PluginBundle() = default;

    // Loads a bundle and looks up one exported data symbol in it.
    //  path    a shared library, or a folder holding "Info.plist" (whose "Executable" names the library) and
    //          the library
    //  symbol  the symbol's name
    // Runs the library's own initialisers on the calling thread. Any thread.
    virtual PluginSymbol load(const std::string& path, const char* symbol) = 0;
};

} // namespace welcomer::platform
