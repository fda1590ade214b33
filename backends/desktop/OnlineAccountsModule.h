// GNOME Online Accounts, as a module.

#pragma once

#include "backends/desktop/OnlineAccounts.h"

namespace welcomer::desktop {

struct OnlineAccountsModule {
    static constexpr char kName[] = "onlineaccounts";
    using Interface = OnlineAccounts;
    struct Arguments {};
};

} // namespace welcomer::desktop
