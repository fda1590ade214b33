// The account server, asked over HTTPS or a Unix socket: docs/account-server.md.

#pragma once

#include "backends/desktop/accountserver/AccountServerModule.h"
#include "backends/desktop/accountserver/Interruption.h"
#include "backends/desktop/accountserver/Transfer.h"

#include <map>
#include <mutex>
#include <string>
#include <vector>

namespace welcomer::desktop {

// Every question is a connection of its own. One that has not carried the request is tried twice more, after
// growing waits and with the same ID, and through the next proxy where the desktop has several; nothing else is
// sent twice. Any thread.
class AccountServerClient final : public AccountServer {
  public:
    explicit AccountServerClient(const AccountServerModule::Arguments& arguments)
        : _settings(arguments.settings()),
          _machine(arguments.machine()) {}

    platform::SignInAnswer answer(const std::string& username, const std::string& password,
                                  const PropertyList::Dictionary& delegateRequest) const override;
    platform::SignInAnswer acceptTerms(const std::string& username, const std::string& password,
                                       const PropertyList& terms) const override;
    std::string server() const override { return _settings.address; }
    PropertyList::Dictionary servicesOfNewAccount(const std::string& username) const override;
    std::optional<std::vector<std::string>> userNames() const override { return std::nullopt; }
    AccountServerLook look() const override;
    void stop() override { _interruption.stop(); }

  private:
    template <class Request>
    TransferOutcome _post(const char* path, const Request& request, const std::string& password) const;
    TransferOutcome _send(const char* path, RequestBody* body) const;
    std::vector<std::string> _proxies() const;
    accountserver::Sender _sender(const std::string& username) const;
    void _remember(const std::string& username, PropertyList::Dictionary services) const;

    const AccountServerSettings _settings;
    const accountserver::Machine _machine;
    mutable Interruption _interruption;
    mutable std::mutex _mutex;                                         // guards what follows
    mutable std::map<std::string, PropertyList::Dictionary> _services; // by user, of the answers so far
};

} // namespace welcomer::desktop
