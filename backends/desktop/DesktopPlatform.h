// The platform on the desktop's own services, each of which serves where it is there; the local backends
// serve elsewhere.

#pragma once

#include "backends/Backends.h"
#include "backends/desktop/DesktopModule.h"
#include "backends/desktop/DesktopNetwork.h"
#include "backends/desktop/accounts/OnlineAccountService.h"
#include "backends/desktop/accounts/OnlineAccountsModule.h"
#include "backends/desktop/accountserver/DesktopSignIn.h"
#include "backends/desktop/credentials/DesktopCredentialStore.h"
#include "backends/desktop/preferences/DesktopPreferenceStore.h"
#include "backends/desktop/resolved/DesktopNameServers.h"
#include "backends/desktop/runloop/DesktopRunLoops.h"
#include "backends/local/LocalPlatform.h"

#include <string>
#include <vector>

namespace welcomer::desktop {

// Making one loads nothing and costs no system call. Only for the root "/": the desktop's services know no
// other.
class DesktopPlatform final : public PlatformOwner {
  public:
    explicit DesktopPlatform(const PlatformOptions& options);

    // Ends what is being asked of the account server.
    ~DesktopPlatform() override { _signIn.stop(); }
    DesktopPlatform(const DesktopPlatform&) = delete;
    DesktopPlatform& operator=(const DesktopPlatform&) = delete;

    const platform::Platform& platform() const override { return _platform; }
    platform::AccountDirectory& accountDirectory() override { return _local.accountDirectory(); }
    platform::SignInDirectory& signInDirectory() override { return _local.signInDirectory(); }
    std::vector<platform::BackendReport> backendReports() override;
    std::string pluginFolder() const override { return _local.pluginFolder(); }
    platform::SettingsReport settings() override { return _local.settings(); }

  private:
    AccountServerModule::Arguments _accountServerArguments();
    OnlineAccountSurroundings _accountSurroundings(const std::string& root);

    local::LocalSystemLog _systemLog; // where the program has chosen no other
    const Modules _modules;
    DesktopRunLoops _runLoops;
    local::NimbusDirectory _nimbusDirectory;
    DesktopSignIn _signIn;
    local::LocalPlatform _local; // stands on _runLoops and _signIn
    DesktopCredentialStore _credentialStore;
    DesktopModule<OnlineAccountsModule> _onlineAccounts;
    OnlineAccountService _accountService;
    DesktopPreferenceStore _preferenceStore;
    DesktopNameServers _nameServers;
    local::LocalNetworkConfigStore _kernelConfigStore; // tells _nameServers
    DesktopNetwork _network;
    const platform::Platform _platform;
};

} // namespace welcomer::desktop
