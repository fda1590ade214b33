// Whom signing in asks: the account server where the settings name one, else the machine's own directory.

#pragma once

#include "backends/desktop/DesktopModule.h"
#include "backends/desktop/accountserver/AccountServerModule.h"
#include "platform/BackendReport.h"
#include "platform/SignInDirectory.h"

#include <optional>
#include <string>

namespace welcomer::desktop {

// Where a server is named and its module cannot be used, nobody can sign in: the machine's directory does not
// stand in for a server.
class DesktopSignIn final : public platform::SignInDirectory {
  public:
    //  local      the machine's own directory; borrowed
    //  arguments  the settings are asked with every question
    DesktopSignIn(platform::SignInDirectory& local, AccountServerModule::Arguments arguments,
                  const Modules& modules)
        : _local(local),
          _settings(arguments.settings),
          _module(nullptr, std::move(arguments), modules) {}

    platform::SignInAnswer answer(const std::string& username, const std::string& password,
                                  const PropertyList::Dictionary& delegateRequest) const override;
    platform::SignInAnswer acceptTerms(const std::string& username, const std::string& password,
                                       const PropertyList& terms) const override;
    std::string server() const override { return _settings().address; }
    PropertyList::Dictionary servicesOfNewAccount(const std::string& username) const override;
    std::optional<std::vector<std::string>> userNames() const override;

    // How the server serves now; none where the settings name none. May block. Any thread.
    std::optional<platform::BackendReport> report();

    // Ends what is being asked of the server. Any thread.
    void stop();

  private:
    bool _asksServer() const { return !server().empty(); }

    // The machine's directory or the server's client; null where that cannot be used.
    const platform::SignInDirectory* _directory() const;

    platform::SignInDirectory& _local;
    const std::function<AccountServerSettings()> _settings;
    mutable DesktopModule<AccountServerModule> _module;
};

// The locale of who runs the program, for texts that people read, as the C library finds it. Any thread.
std::string messagesLocale();

} // namespace welcomer::desktop
