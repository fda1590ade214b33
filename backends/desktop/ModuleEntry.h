// What a program and a module of the desktop backends agree on.
//
// Each desktop backend is a shared library of its own, a module, which a program loads when the backend's
// interface is first asked for (DesktopModule.h): no program links the desktop's libraries, and none loads
// those that it does not use.
//
// C++ objects cross between the two. Both are built from the same sources by the same compiler, which `build`
// makes sure of, and use one heap, the C library's. But each has a C++ runtime of its own: the agent, and
// every module, has it built in, because loading and binding the shared one takes longer than all that an
// agent without work does. Hence the rules:
//
//  - What crosses is made of the interfaces in platform/ and of standard containers, strings, smart
//    pointers and
//    functions: all code that a side runs on them is its own, or is reached through a pointer in the object.
//  - No exception crosses, in either direction: one runtime cannot count another's. Operations of a
//    module's service are
//    `noexcept`, or catch everything themselves; what a program hands in for a module to call does not throw.
//  - A module has its own copy of every static object: platform::current() is not installed there
//    and thread-local
//    objects (local::LocalRunLoops) are others. A module takes what it needs from its arguments, and logs
//    nothing.
//  - Nothing is ever unloaded.
//
// How to add a backend:
//
//  1. Describe the module in backends/desktop/NameModule.h, for both sides, as RunLoopModule.h does.
//  2. Write backends/desktop/name/: the service, derived from the interface, and one file that ends with
//         WELCOMER_DESKTOP_MODULE(NameModule, createService, describeService)
//     Say welcomer_desktop_module(name PACKAGES ... SOURCES ...) in backends/desktop/CMakeLists.txt.
//  3. On the program's side, without the service's library, write DesktopName.h: the interface once more,
//     each operation
//     handed to DesktopModule<NameModule>::service(), or to the local backend where that is null, as
//     DesktopRunLoops does.
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
    //  result  Module::Interface, owned by the caller, who deletes it through the
    //          interface; null when the desktop's service is not there: `whyNot` then
    //          says why, in one line
    void* (*create)(const void* arguments, std::string& whyNot) noexcept;

    // Says how the backend serves now: fills `backend`, `reason` and `advice`. May block while the desktop's
    // service answers. Any thread; also when `create` has never been called or has made nothing.
    //  result  whether the desktop's service serves
    bool (*describe)(const void* arguments, platform::BackendReport& report) noexcept;
};

inline constexpr char kModuleEntrySymbol[] = "welcomer_desktop_module";

namespace detail {

template <class Module>
using Create = std::unique_ptr<typename Module::Interface> (*)(const typename Module::Arguments&,
                                                               std::string&);
template <class Module>
using Describe = bool (*)(const typename Module::Arguments&, platform::BackendReport&);

template <class Module, Create<Module> create>
void* createErased(const void* arguments, std::string& whyNot) noexcept {
    return create(*static_cast<const typename Module::Arguments*>(arguments), whyNot).release();
}

template <class Module, Describe<Module> describe>
bool describeErased(const void* arguments, platform::BackendReport& report) noexcept {
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
