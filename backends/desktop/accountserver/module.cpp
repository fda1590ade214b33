#include "backends/desktop/ModuleEntry.h"
#include "backends/desktop/accountserver/AccountServerClient.h"

namespace welcomer::desktop {

namespace {

std::unique_ptr<AccountServer> createAccountServer(AccountServer* /*local*/,
                                                   const AccountServerModule::Arguments& arguments,
                                                   std::string& /*whyNot*/) {
    return std::make_unique<AccountServerClient>(arguments);
}

bool describeAccountServer(const AccountServerModule::Arguments& arguments, platform::BackendReport& report) {
    const AccountServerClient client(arguments);
    const AccountServerLook look = client.look();
    report.backend = client.server();
    report.reason = look.text;
    report.advice = look.advice;
    return look.isRight;
}

} // namespace

} // namespace welcomer::desktop

WELCOMER_DESKTOP_MODULE(welcomer::desktop::AccountServerModule, welcomer::desktop::createAccountServer,
                        welcomer::desktop::describeAccountServer)
