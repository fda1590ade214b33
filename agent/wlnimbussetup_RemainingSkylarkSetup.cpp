#include "agent/wlnimbussetup_RemainingSkylarkSetup.h"

#include "cloud/WLNimbusServiceCatalogue.h"
#include "cloud/WLNimbusSetupWithDictionary.h"
#include "log/PCLogManager.h"
#include "platform/Platform.h"

#include <exception>

namespace welcomer {

void wlnimbussetup_RemainingSkylarkSetup(const std::string& accountName,
                                         [[maybe_unused]] const std::shared_ptr<platform::WorkGroup>& group) {
    WL_LOG("Killing onlineaccounts");
    try {
        // Its exit status says no more than whether there was such a process.
        platform::current().processLauncher.launchAndWait("/usr/bin/killall",
                                                          {"-9", "com.corvid.onlineaccounts"});
    } catch (const std::exception& exception) {
        WL_LOG("Exception killing onlineaccounts: %@", exception);
    }
    WL_LOG("Enabling post-login services for account %@", accountName);
    WLNimbusSetupWithDictionary2({{platform::kSKPropertyAccountID, accountName}},
                                 WLNimbusAllSetupServiceIDs(), false, true, nullptr, nullptr);
}

} // namespace welcomer
