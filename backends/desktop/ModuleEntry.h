// What a program and a module of the desktop backends agree on.
//
// Each desktop backend is a shared library of its own, a module, which a program loads when the backend's
// interface is first asked for (DesktopModule.h): no program links the desktop's libraries, and none loads
// those that it does not use.
//
// C++ objects and exceptions cross between the two as within one program: both are built from the same
// sources by the same compiler, which `build` makes sure of, and the process has one C++ runtime and one
// heap. Yet a module links the system's static library for itself, which leaves these rules:
//
//  - A module has its own copy of every static object: platform::current() is not installed there, and
//    thread-local objects (local::LocalRunLoops) are others. A module takes what it needs from its
//    arguments, and logs nothing.
//  - What a module hands to a library that calls it back is called through that library's C code: no
//    exception may leave it.
//  - Nothing is ever unloaded.
//
// How to add a backend:
//
//  1. Describe the module in backends/desktop/NameModule.h, for both sides, as RunLoopModule.h does.
//  2. Write backends/desktop/name/: the service, derived from the interface, and one file that ends with
//         WELCOMER_DESKTOP_MODULE(NameModule, createService, describeService)
//     Say welcomer_desktop_module(name PACKAGES ... SOURCES ...) in backends/desktop/CMakeLists.txt.
//  3. On the program's side, without the service's library, write DesktopName.h: the interface once more,
//     each operation handed to DesktopModule<NameModule>::service(), or to the local backend where that is
//     null, as DesktopRunLoops does.
//  4. Make it a member of DesktopPlatform, and add its report there.

#pragma once

#include "platform/BackendReport.h"

#include <memory>
#include <string>

namespace welcomer::desktop {

// The one symbol that a module exports has this type. The functions' arguments are Module::Arguments.
struct ModuleEntry {
    const char* build; // what the module was built from and with: WELCOMER_MODULE_BUILD

    // Makes the service. Called once, on the thread that first asks for it.
    //  result  Module::Interface, owned by the caller, who deletes it through the interface; null when the
    //          desktop's service is not there: `whyNot` then says why, in one line
    void* (*create)(const void* arguments, std::string& whyNot);

    // Says how the backend serves now: fills `backend`, `reason` and `advice`. May block while the desktop's
    // service answers. Any thread; also when `create` has never been called or has made nothing.
    //  result  whether the desktop's service serves
    bool (*describe)(const void* arguments, platform::BackendReport& report);
};

inline constexpr char kModuleEntrySymbol[] = "welcomer_desktop_module";

namespace detail {

template <class Module>
using Create = std::unique_ptr<typename Module::Interface> (*)(const typename Module::Arguments&,
                                                               std::string&);
template <class Module>
using Describe = bool (*)(const typename Module::Arguments&, platform::BackendReport&);

template <class Module, Create<Module> create>
void* createErased(const void* arguments, std::string& whyNot) {
    return create(*static_cast<const typename Module::Arguments*>(arguments), whyNot).release();
}

template <class Module, Describe<Module> describe>
bool describeErased(const void* arguments, platform::BackendReport& report) {
    return describe(*static_cast<const typename Module::Arguments*>(arguments), report);
}

} // namespace detail
} // namespace welcomer::desktop

// Exports a module's entry; once in a module, at namespace scope.
//  Module    the description that both sides share
//  create    std::unique_ptr<Module::Interface> (const Module::Arguments&, std::string& whyNot)
//  describe  bool (const Module::Arguments&, platform::BackendReport&)
#define WELCOMER_DESKTOP_MODULE(Module, create, describe)                                                    \
    extern "C"                                                                                               \
        [[gnu::visibility("default")]] const welcomer::desktop::ModuleEntry welcomer_desktop_module = {      \
            WELCOMER_MODULE_BUILD, welcomer::desktop::detail::createErased<Module, create>,                  \
            welcomer::desktop::detail::describeErased<Module, describe>};
