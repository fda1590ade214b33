// The accounts that the user has with GNOME Online Accounts.

#pragma once

#include "backends/desktop/accounts/OnlineAccounts.h"
#include "backends/desktop/glib/Bus.h"
#include "backends/posix/FileLock.h"

#include <atomic>
#include <functional>
#include <mutex>
#include <utility>

namespace welcomer::desktop {

// Every question asks the daemon anew, which takes about 2 ms, on a connection to the session bus that is
// this object's own: nothing of it runs on a main context of the process, and the end of the bus does not end
// the process. A daemon that does not run is started by the bus where it can be. One that has kept a question
// waiting until the time was up, after 25 s, is not asked again; nor is a bus that has not answered after
// ten. A switch takes effect after some 300 ms; it
// is waited for up to ten seconds. Where no keyring takes the password the daemon makes the account all the
// same, and has the user give it again.
class GoaOnlineAccounts final : public OnlineAccounts {
  public:
    //  lock  keeps the user's other processes out, asked when an account is to be made
    explicit GoaOnlineAccounts(std::function<posix::FileLock()> lock) : _lock(std::move(lock)) {}

    // In what state the daemon is.
    enum class Daemon { WithoutBus, Absent, Startable, Silent, Answers };

    // Looks at the daemon without starting it. One that has not answered after five seconds is silent. Any
    // thread.
    Daemon look();

    std::optional<std::vector<OnlineAccount>> list() override;
    bool setFeature(const OnlineAccount& account, OnlineFeature feature, bool isOn) override;
    bool makeOnce(const NewOnlineAccount& account) override;

  private:
    BusConnection _connection(const Deadline& deadline);

    const std::function<posix::FileLock()> _lock;
    std::mutex _making;                              // keeps other threads out
    Bus _bus{G_BUS_TYPE_SESSION, Bus::Sharing::Own}; // leaves the process's shared one alone
    std::atomic<bool> _isGivenUp{false};
};

} // namespace welcomer::desktop
