#include "backends/desktop/SessionBusTrace.h"

#include "platform/Path.h"

#include <cstdlib>
#include <string>
#include <unistd.h>

namespace welcomer::desktop {

namespace {

// Empty where it is not set.
std::string environmentVariable(const char* name) {
    const char* const value = std::getenv(name);
    return value ? value : "";
}

} // namespace

bool mayHaveSessionBus() {
    if (!environmentVariable("DBUS_SESSION_BUS_ADDRESS").empty()) {
        return true;
    }
    const std::string runtimeFolder = environmentVariable("XDG_RUNTIME_DIR");
    return !runtimeFolder.empty() && ::access(platform::joinPath(runtimeFolder, "bus").c_str(), F_OK) == 0;
}

} // namespace welcomer::desktop
