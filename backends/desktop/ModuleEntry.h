// What a program and a module of the desktop backends agree on.
//
// Each desktop backend is a shared library of its own, a module, which a program loads when the backend's
// interface is first asked for (DesktopModule.h): no program links the desktop's libraries, and none loads
// those that it does not use.
//
// C++ objects and exceptions cross between the two as within one program: both are built from the same
// sources by the same compiler, which `build` makes sure of, and the process has one C++ runtime and one
// heap. A module links the shared library that loads it, and takes from the backends in it what is exported under
// that version's own name: of another version's library, the loader refuses it. Yet a program that holds all
// of the library itself, as tests do, has another copy than its modules, which leaves these rules:
//
//  - A module asks for nothing that is kept in the library: platform::current(), thread-local objects
//    (local::LocalRunLoops). It takes what it needs from its arguments, and logs nothing.
//  - What a module hands to a library that calls it back is called through that library's C code: no
//    exception may leave it.
//  - Nothing is ever unloaded.
//
// How to add a backend, in a room of its own:
//
//  1. Describe the module in NameModule.h, for both sides, as runloop/RunLoopModule.h does.
//  2. Write the service, derived from the interface, and one file that ends with
//         WELCOMER_DESKTOP_MODULE(NameModule, createService, describeService)
//     Say welcomer_desktop_module(name PACKAGES ... SOURCES ...) in backends/desktop/CMakeLists.txt.
//  3. On the program's side, without the service's library, write DesktopName.h: the interface once more,
//     each operation handed to DesktopModule<NameModule>::service(), which is the local service where the
//     desktop's is not there.
//  4. Make it a member of DesktopPlatform, and add its report there.

#pragma once

#include "platform/BackendReport.h"

#include <memory>
#include <string>

namespace welcomer::desktop {

// The one symbol that a module exports has this type. `Module` is the description that both sides share, with
// kName, Interface and Arguments.
template <class Module>
struct ModuleEntry {
    using Interface = typename Module::Interface;
    using Arguments = typename Module::Arguments;

    // What the module was built from and with: WELCOMER_MODULE_BUILD. It comes first, and is read before
    // anything else of a module that may be another one.
    const char* build;

    // Makes the service that stands in front of the local one. Called once, on the thread that first asks for
    // it.
    //  local   what serves where the desktop's service does not, or null where there is no such
    //          thing; borrowed
    //  result  null when the desktop's service is not there: `whyNot` then says why, in one line
    std::unique_ptr<Interface> (*create)(Interface* local, const Arguments& arguments, std::string& whyNot);

    // Says how the backend serves now: fills `backend`, `reason` and `advice`. May block while the desktop's
    // service answers. Any thread; also when `create` has never been called or has made nothing.
    //  result  whether the desktop's service serves
    bool (*describe)(const Arguments& arguments, platform::BackendReport& report);
};

inline constexpr char kModuleEntrySymbol[] = "welcomer_desktop_module";

} // namespace welcomer::desktop

// Exports a module's entry; once in a module, at namespace scope.
#define WELCOMER_DESKTOP_MODULE(Module, create, describe)                                                    \
    extern "C" [[gnu::visibility("default")]] const welcomer::desktop::ModuleEntry<Module>                   \
        welcomer_desktop_module = {WELCOMER_MODULE_BUILD, create, describe};
