#include "backends/desktop/DesktopCredentialStore.h"

#include "platform/Path.h"

#include <cstdlib>
#include <unistd.h>
#include <utility>

namespace welcomer::desktop {

namespace {

constexpr char kLockName[] = "CredentialSearch"; // not the local store's own, which it takes meanwhile

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

DesktopCredentialStore::DesktopCredentialStore(local::RootFolder root, platform::ProcessIdentity& identity,
                                               platform::CredentialStore& local,
                                               CredentialModule::Arguments arguments)
    : _root(std::move(root)),
      _identity(identity),
      _module(arguments),
      _store([this] { return mayHaveSessionBus() ? _module.service() : nullptr; }, local,
             [this] {
                 // Makes the library folder where it is missing.
                 const std::vector<std::string> libraries = _identity.userLibraryDirectories();
                 return libraries.empty()
                            ? local::FileLock()
                            : local::FileLock(_root, local::userLockPath(libraries.front(), kLockName));
             }) {}

platform::BackendReport DesktopCredentialStore::report() {
    platform::BackendReport report{"CredentialStore", "local file", "", ""};
    if (!mayHaveSessionBus()) {
        report.reason = "there is no session bus";
        report.advice = "log in to a desktop session, with a Secret Service such as gnome-keyring";
        return report;
    }
    _module.describe(report);
    return report;
}

} // namespace welcomer::desktop
