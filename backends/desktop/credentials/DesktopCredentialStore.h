// The credential store of a desktop: the Secret Service on the session bus, with the local store behind it.

#pragma once

#include "backends/desktop/DesktopModule.h"
#include "backends/desktop/credentials/CredentialModule.h"
#include "backends/desktop/credentials/SearchListCredentialStore.h"
#include "backends/posix/RootFolder.h"
#include "platform/ProcessIdentity.h"

#include <string>

namespace welcomer::desktop {

// The module is loaded at the first operation that finds a session bus.
class DesktopCredentialStore {
  public:
    //  root      the folder below which the lock is looked up
    //  identity  says where the user's library is; borrowed
    //  local     the local store; borrowed
    DesktopCredentialStore(
        posix::RootFolder root, platform::ProcessIdentity& identity, platform::CredentialStore& local,
        CredentialModule::Arguments arguments = {},
        SearchListCredentialStore::NewItems newItems = SearchListCredentialStore::NewItems::ToTheService,
        const Modules& modules = {});

    platform::CredentialStore& store() { return _store; }

    // Starts no service. Where the local store serves and no item could be created in it, the reason says
    // why. Any thread; may block while the service answers.
    platform::BackendReport report();

  private:
    // Whether there is a Secret Service though no bus can be asked (SecretServiceTraces.h).
    bool _isSomewhere();

    platform::BackendReport _whoServes();

    const posix::RootFolder _root;
    platform::ProcessIdentity& _identity;
    platform::CredentialStore& _local;
    DesktopModule<CredentialModule> _module;
    SearchListCredentialStore _store;
};

} // namespace welcomer::desktop
