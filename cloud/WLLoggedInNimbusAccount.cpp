#include "cloud/WLLoggedInNimbusAccount.h"

#include "cloud/WLNimbusServiceCatalogue.h"
#include "platform/Platform.h"

#include <algorithm>
#include <string>
#include <vector>

namespace welcomer {

std::shared_ptr<platform::CloudAccount> WLLoggedInNimbusAccount() {
    return platform::current().accountService.loggedInAccount();
}

bool WLHasLoggedInNimbusAccount() {
    return WLLoggedInNimbusAccount() != nullptr;
}

bool WLNoNimbusServicesEnabled() {
    const std::shared_ptr<platform::CloudAccount> account = WLLoggedInNimbusAccount();
    const std::vector<std::string> identifiers = WLNimbusAllSetupServiceIDs();
    return std::none_of(identifiers.begin(), identifiers.end(), [&](const std::string& identifier) {
        return platform::current().accountService.isServiceEnabled(account.get(), identifier);
    });
}

} // namespace welcomer
