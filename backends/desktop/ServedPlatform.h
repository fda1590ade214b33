// The platform below another root than "/", where signing in asks an account server. The desktop's services know of
// no such root.

#pragma once

#include "backends/desktop/DesktopModule.h"
#include "backends/desktop/accountserver/DesktopSignIn.h"
#include "backends/local/LocalPlatform.h"
#include "platform/PlatformOwner.h"

#include <vector>

namespace welcomer::desktop {

// Making one loads nothing and costs no system call.
class ServedPlatform final : public PlatformOwner {
  public:
    //  options  with an account server
    explicit ServedPlatform(const PlatformOptions& options);

    // Ends what is being asked of the account server.
    ~ServedPlatform() override { _signIn.stop(); }
    ServedPlatform(const ServedPlatform&) = delete;
    ServedPlatform& operator=(const ServedPlatform&) = delete;

    const platform::Platform& platform() const override { return _local.platform(); }
    platform::AccountDirectory& accountDirectory() override { return _local.accountDirectory(); }
    platform::SignInDirectory& signInDirectory() override { return _local.signInDirectory(); }
    std::vector<platform::BackendReport> backendReports() override;
    std::string pluginFolder() const override { return _local.pluginFolder(); }
    platform::SettingsReport settings() override { return _local.settings(); }

  private:
    local::LocalSystemLog _systemLog; // where the program has chosen no other
    const Modules _modules;
    local::NimbusDirectory _nimbusDirectory;
    DesktopSignIn _signIn;
    local::LocalPlatform _local; // stands on _signIn
};

} // namespace welcomer::desktop
