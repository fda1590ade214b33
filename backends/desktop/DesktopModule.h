// A program's side of a desktop backend: finds the module, loads it once, and makes its service.

#pragma once

#include "backends/desktop/ModuleEntry.h"
#include "platform/SystemLog.h"

#include <memory>
#include <mutex>
#include <string>
#include <utility>

namespace welcomer::desktop {

// Where a program's modules are, and who is told of one that cannot be used.
struct Modules {
    platform::SystemLog* systemLog = nullptr; // borrowed; null: nobody
    std::string folder = {};                  // empty: where loadModule() looks for them
};

// What loading a module has come to.
struct ModuleOutcome {
    const void* entry = nullptr; // a ModuleEntry of its description, valid until the process ends; or null
    std::string whyNot = {};     // one line where there is no entry
    bool isMissing = false;      // whether that is because nobody has installed these modules
};

// Loads the module NAME.so and checks that it belongs to this library.
//  folder  where the modules are; empty: in the folder of this version beside the library, wherever that has been
//          moved to
// Any thread. Loading is what takes time: callers keep the result.
ModuleOutcome loadModule(const std::string& name, const std::string& folder);

// Whether the module NAME.so is where loadModule() looks for it. Any thread.
bool isModuleInstalled(const std::string& name, const std::string& folder);

// Writes one record that says why what is local serves in a module's place. Any thread.
void reportFallback(const Modules& modules, const std::string& name, const std::string& whyNot);

// One module and its one service, with the local one behind it: the one place where the desktop's services
// fall back, which the system log is told of unless the modules are just not installed. `Module` describes it:
// kName, Interface and Arguments.
template <class Module>
class DesktopModule {
  public:
    using Interface = typename Module::Interface;
    using Arguments = typename Module::Arguments;

    // Costs nothing: everything happens when the service is first asked for.
    //  local  what serves where the desktop's service does not, or null; borrowed
    explicit DesktopModule(Interface* local, Arguments arguments = {}, Modules modules = {})
        : _local(local),
          _arguments(std::move(arguments)),
          _modules(std::move(modules)) {}

    // The service, borrowed; the local one when the desktop's is not there, and then it never will be. Throws
    // what making it throws, once. Any thread.
    Interface* service() {
        const std::lock_guard lock(_mutex);
        if (!_isSettled) {
            _isSettled = true;
            if (const Entry* entry = _load()) {
                _service = entry->create(_local, _arguments, _loaded.whyNot);
            }
            if (!_service && !_loaded.isMissing) {
                reportFallback(_modules, Module::kName, _loaded.whyNot);
            }
        }
        return _service ? _service.get() : _local;
    }

    // The desktop's service where it has been made, else null; makes none. Borrowed. Any thread.
    Interface* madeService() {
        const std::lock_guard lock(_mutex);
        return _service.get();
    }

    // Whether there is a module, as far as is known without loading it. Any thread.
    bool isThere() {
        const std::lock_guard lock(_mutex);
        return _wasLoaded ? _loaded.entry != nullptr : isModuleInstalled(Module::kName, _modules.folder);
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
        report.reason = _loaded.whyNot;
        report.advice =
            _loaded.isMissing
                ? "install the desktop backends, or build with WELCOMER_DESKTOP where their libraries are"
                : "start this program anew if Welcomer was upgraded meanwhile, or install its desktop "
                  "backends anew";
        return false;
    }

  private:
    using Entry = ModuleEntry<Module>;

    const Entry* _load() {
        if (!_wasLoaded) {
            _wasLoaded = true;
            _loaded = loadModule(Module::kName, _modules.folder);
        }
        return static_cast<const Entry*>(_loaded.entry);
    }

    Interface* const _local;
    const Arguments _arguments;
    const Modules _modules;
    std::mutex _mutex;
    bool _wasLoaded = false;
    bool _isSettled = false;
    ModuleOutcome _loaded;
    std::unique_ptr<Interface> _service;
};

} // namespace welcomer::desktop
