#include "backends/desktop/credentials/DesktopCredentialStore.h"

#include "backends/desktop/SessionBusTrace.h"
#include "backends/desktop/credentials/SecretServiceTraces.h"

#include <utility>

namespace welcomer::desktop {

namespace {

constexpr char kLockName[] = "CredentialSearch"; // not the local store's own, which it takes meanwhile
constexpr char kLocal[] = "local file";
constexpr char kNone[] = "none"; // who serves where a bus cannot be asked

} // namespace

DesktopCredentialStore::DesktopCredentialStore(posix::RootFolder root, platform::ProcessIdentity& identity,
                                               platform::CredentialStore& local,
                                               CredentialModule::Arguments arguments,
                                               SearchListCredentialStore::NewItems newItems,
                                               const Modules& modules)
    : _root(std::move(root)),
      _identity(identity),
      _local(local),
      _module(nullptr, arguments, modules),
      _store(
          {[this] { return mayHaveSessionBus() ? _module.service() : nullptr; },
           [this] {
               return _isSomewhere();
           }},
          local,
          [this] {
              // Makes the library folder where it is missing.
              const std::vector<std::string> libraries = _identity.userLibraryDirectories();
              return libraries.empty()
                         ? posix::FileLock()
                         : posix::FileLock(_root, posix::userLockPath(libraries.front(), kLockName));
          },
          newItems) {}

bool DesktopCredentialStore::_isSomewhere() {
    return _module.isThere() && hasSecretServiceTraces(_root, _identity);
}

platform::BackendReport DesktopCredentialStore::report() {
    platform::BackendReport report = _whoServes();
    const platform::CredentialOutcome examined = _local.examine();
    if (report.backend == kLocal && examined != platform::kCredentialSuccess) {
        report.reason += "; " + platform::credentialOutcomeText(examined);
    }
    return report;
}

platform::BackendReport DesktopCredentialStore::_whoServes() {
    platform::BackendReport report{"CredentialStore", kLocal, "", ""};
    const bool isSomewhere = _isSomewhere();
    if (!mayHaveSessionBus()) {
        report.backend = isSomewhere ? kNone : report.backend;
        report.reason = isSomewhere ? "there is no session bus, so that the keyring cannot be asked"
                                    : "there is no session bus";
        report.advice = "log in to a desktop session, with a Secret Service such as gnome-keyring";
        return report;
    }
    _module.describe(report);
    if (report.backend == kNone && !isSomewhere) {
        report.backend = kLocal;
    }
    return report;
}

} // namespace welcomer::desktop
