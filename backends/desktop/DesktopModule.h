// A program's side of a desktop backend: finds the module, loads it once, and makes its service.

#pragma once

#include "backends/desktop/ModuleEntry.h"

#include <memory>
#include <mutex>
#include <string>
#include <utility>

namespace welcomer::desktop {

// Loads the module NAME.so and checks that it belongs to this program.
//  folder  where the modules are; empty: beside the program (in a build tree, and in an installed one,
//          wherever that has been moved to), then where this build is installed
//  whyNot  one line when there is no result
//  result  the module's entry, a ModuleEntry of its description, valid until the process ends; or null
// Any thread. Loading is what takes time: callers keep the result.
const void* loadModule(const std::string& name, const std::string& folder, std::string& whyNot);

// Whether the module NAME.so is where loadModule() looks for it. Any thread.
bool isModuleInstalled(const std::string& name, const std::string& folder);

// One module and its one service, with the local one behind it: the one place where the desktop's services
// fall back. `Module` describes it: kName, Interface and Arguments.
template <class Module>
class DesktopModule {
  public:
    using Interface = typename Module::Interface;
    using Arguments = typename Module::Arguments;

    // Costs nothing: everything happens when the service is first asked for.
    //  local   what serves where the desktop's service does not, or null; borrowed
    //  folder  where the module is; empty: where it is looked for anyway
    explicit DesktopModule(Interface* local, Arguments arguments = {}, std::string folder = "")
        : _local(local),
          _arguments(std::move(arguments)),
          _folder(std::move(folder)) {}

    // The service, borrowed; the local one when the desktop's is not there, and then it never will be. Throws
    // what making it throws, once. Any thread.
    Interface* service() {
        const std::lock_guard lock(_mutex);
        if (!_isSettled) {
            _isSettled = true;
            if (const Entry* entry = _load()) {
                _service = entry->create(_local, _arguments, _whyNot);
            }
        }
        return _service ? _service.get() : _local;
    }

    // Whether there is a module, as far as is known without loading it. Any thread.
    bool isThere() {
        const std::lock_guard lock(_mutex);
        return _wasLoaded ? _entry != nullptr : isModuleInstalled(Module::kName, _folder);
    }

    // Has the module say how it serves now.
    //  report  filled in: `backend`, `reason` and `advice` where the module can be loaded, else `reason` and
    //          `advice`
    //  result  whether the desktop's service serves
    // Any thread.
    bool describe(platform::BackendReport& report) {
        const std::lock_guard lock(_mutex);
        if (const Entry* entry = _load()) {
            return entry->describe(_arguments, report);
        }
        report.reason = _whyNot;
        report.advice =
            "install the desktop backends, or build with WELCOMER_DESKTOP where their libraries are";
        return false;
    }

  private:
    using Entry = ModuleEntry<Module>;

    const Entry* _load() {
        if (!_wasLoaded) {
            _wasLoaded = true;
            _entry = static_cast<const Entry*>(loadModule(Module::kName, _folder, _whyNot));
        }
        return _entry;
    }

    Interface* const _local;
    const Arguments _arguments;
    const std::string _folder;
    std::mutex _mutex;
    bool _wasLoaded = false;
    bool _isSettled = false;
    const Entry* _entry = nullptr;
    std::unique_ptr<Interface> _service;
    std::string _whyNot;
};

} // namespace welcomer::desktop
