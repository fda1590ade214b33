#include "backends/desktop/ModuleEntry.h"
#include "backends/desktop/OnlineAccountsModule.h"
#include "backends/desktop/onlineaccounts/GoaOnlineAccounts.h"

namespace welcomer::desktop {

namespace {

// Whether the daemon serves is asked with every question.
std::unique_ptr<OnlineAccounts> createOnlineAccounts(const OnlineAccountsModule::Arguments& arguments,
                                                     std::string& /*whyNot*/) {
    return std::make_unique<GoaOnlineAccounts>(arguments.lock);
}

bool describeOnlineAccounts(const OnlineAccountsModule::Arguments& arguments,
                            platform::BackendReport& report) {
    const auto accounts = GoaOnlineAccounts(arguments.lock).list();
    if (!accounts) {
        report.reason = "no daemon of GNOME Online Accounts answers on the session bus";
        report.advice = "install gnome-online-accounts, and run within a desktop session";
        return false;
    }
    report.backend = "GNOME Online Accounts";
    report.reason = "its daemon answers, with " + std::to_string(accounts->size()) +
                    (accounts->size() == 1 ? " account" : " accounts") +
                    "; what they have no switch for is kept in the account file";
    return true;
}

} // namespace

} // namespace welcomer::desktop

WELCOMER_DESKTOP_MODULE(welcomer::desktop::OnlineAccountsModule, welcomer::desktop::createOnlineAccounts,
                        welcomer::desktop::describeOnlineAccounts)
