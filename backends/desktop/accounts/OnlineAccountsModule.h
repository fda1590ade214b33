// GNOME Online Accounts, as a module.

#pragma once

#include "backends/desktop/accounts/OnlineAccounts.h"
#include "backends/posix/FileLock.h"

#include <functional>

namespace welcomer::desktop {

struct OnlineAccountsModule {
    static constexpr char kName[] = "onlineaccounts";
    using Interface = OnlineAccounts;
    struct Arguments {
        // Takes the lock that keeps this user's other processes from making an account; asked when one is to
        // be made.
        std::function<posix::FileLock()> lock;
    };
};

} // namespace welcomer::desktop
