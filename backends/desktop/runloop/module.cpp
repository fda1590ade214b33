#include "backends/desktop/ModuleEntry.h"
#include "backends/desktop/runloop/GLibRunLoop.h"
#include "backends/desktop/runloop/RunLoopModule.h"

#include <glib.h>

namespace welcomer::desktop {

namespace {

std::unique_ptr<platform::RunLoops> createRunLoops(platform::RunLoops* /*local*/,
                                                   const RunLoopModule::Arguments& /*arguments*/,
                                                   std::string& whyNot) {
    std::unique_ptr<platform::RunLoops> loops = GLibRunLoops::create();
    if (!loops) {
        whyNot = "another thread runs GLib's default main context";
    }
    return loops;
}

bool describeRunLoops(const RunLoopModule::Arguments& /*arguments*/, platform::BackendReport& report) {
    report.backend = "GLib main context";
    report.reason = "GLib " + std::to_string(glib_major_version) + "." + std::to_string(glib_minor_version) +
                    " is there; other threads use standard ones";
    return true;
}

} // namespace

} // namespace welcomer::desktop

WELCOMER_DESKTOP_MODULE(welcomer::desktop::RunLoopModule, welcomer::desktop::createRunLoops,
                        welcomer::desktop::describeRunLoops)
