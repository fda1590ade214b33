#include "backends/desktop/ModuleEntry.h"
#include "backends/desktop/accounts/GoaOnlineAccounts.h"
#include "backends/desktop/accounts/OnlineAccountsModule.h"

namespace welcomer::desktop {

namespace {

// Whether the daemon serves is asked with every question.
std::unique_ptr<OnlineAccounts> createOnlineAccounts(OnlineAccounts* /*local*/,
                                                     const OnlineAccountsModule::Arguments& arguments,
                                                     std::string& /*whyNot*/) {
    return std::make_unique<GoaOnlineAccounts>(arguments.lock);
}

// What a daemon that answers has to say.
void describeAnswer(GoaOnlineAccounts& onlineAccounts, platform::BackendReport& report) {
    const auto accounts = onlineAccounts.list();
    const std::size_t count = accounts ? accounts->size() : 0;
    report.reason = "its daemon answers, with " + std::to_string(count) +
                    (count == 1 ? " account" : " accounts") +
                    "; what they have no switch for is kept in the account file";
}

bool describeOnlineAccounts(const OnlineAccountsModule::Arguments& arguments,
                            platform::BackendReport& report) {
    GoaOnlineAccounts onlineAccounts(arguments.lock);
    const GoaOnlineAccounts::Daemon daemon = onlineAccounts.look();
    switch (daemon) {
    case GoaOnlineAccounts::Daemon::WithoutBus:
    case GoaOnlineAccounts::Daemon::Absent:
        report.reason = daemon == GoaOnlineAccounts::Daemon::Absent
                            ? "no daemon of GNOME Online Accounts runs or can be started"
                            : "no session bus answers";
        report.advice = "install gnome-online-accounts, and run within a desktop session";
        return false;
    case GoaOnlineAccounts::Daemon::Startable:
        report.reason = "its daemon does not run; the session bus starts it when it is needed";
        break;
    case GoaOnlineAccounts::Daemon::Silent:
        report.reason = "its daemon runs, does not answer";
        report.advice = "end goa-daemon; the session bus starts it anew";
        break;
    case GoaOnlineAccounts::Daemon::Answers:
        describeAnswer(onlineAccounts, report);
        break;
    }
    report.backend = "GNOME Online Accounts";
    return true;
}

} // namespace

} // namespace welcomer::desktop

WELCOMER_DESKTOP_MODULE(welcomer::desktop::OnlineAccountsModule, welcomer::desktop::createOnlineAccounts,
                        welcomer::desktop::describeOnlineAccounts)
