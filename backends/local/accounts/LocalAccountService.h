// Accounts in a file of the user's own, authenticated against a file of the machine.

#pragma once

#include "backends/local/accounts/AccountFile.h"
#include "backends/local/accounts/NimbusDirectory.h"
#include "platform/AccountService.h"
#include "platform/DispatchQueue.h"
#include "platform/NotificationCenter.h"
#include "platform/RunLoop.h"

#include <memory>

namespace welcomer::local {

// AccountFile.h says where the accounts are, NimbusDirectory.h who can sign in and with what answer. Every
// question reads the file anew, so that other processes' changes are seen; handles hold no more than names.
// It shows no interface, so that windows and failure dialogs mean nothing to it.
class LocalAccountService final : public platform::AccountService, public platform::AccountManager {
  public:
    // Borrows everything, which must outlive this and the queues' work.
    //  directory  takes the place of the machine's file of users, or null
    LocalAccountService(const posix::RootFolder& root, platform::ProcessIdentity& identity,
                        platform::RunLoops& runLoops, platform::DispatchQueues& dispatchQueues,
                        platform::NotificationCenter& notificationCenter, platform::SystemLog& log,
                        const platform::SignInDirectory* directory = nullptr);

    platform::AccountManager& sharedManager() override { return *this; }
    std::shared_ptr<platform::CloudAccount> loggedInAccount() override;
    bool isServiceEnabled(platform::CloudAccount* account, const std::string& identifier) override;

    std::shared_ptr<platform::CloudAccount> accountForID(const std::optional<PropertyList>& identifier,
                                                         bool createIfMissing) override;
    void authenticate(const std::string& username, const std::string& password,
                      const PropertyList::Dictionary& delegateRequest) override;
    void finishSignIn(const std::string& username, const std::string& password,
                      const PropertyList::Dictionary& delegateRequest) override;
    void markSetupFinished(const std::optional<PropertyList>& information) override;

  private:
    struct Accounts;
    class Account;
    class Service;
    struct Operation;

    void _start(const std::shared_ptr<Operation>& operation);

    const std::shared_ptr<Accounts> _accounts; // shared with handles and with operations that are under way
    platform::RunLoops& _runLoops;
    platform::DispatchQueues& _dispatchQueues;
    platform::NotificationCenter& _notificationCenter;
    const std::shared_ptr<const bool> _isAlive; // an answer that comes later is dropped
};

} // namespace welcomer::local
