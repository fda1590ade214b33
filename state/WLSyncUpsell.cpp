#include "state/WLSyncUpsell.h"

#include "cloud/WLSetupProbes.h"
#include "log/PCLogManager.h"
#include "platform/Platform.h"
#include "state/WLPerUserState.h"
#include "state/WLRecordSetupSeen.h"

namespace welcomer {

namespace {

constexpr char kFunction[] = "BOOL WLCurrentUserGetsSyncUpsell()";

} // namespace

bool WLCurrentUserGetsSyncUpsell() {
    platform::AccountService& accounts = platform::current().accountService;
    const auto account = accounts.loggedInAccount();
    if (!account) {
        return false;
    }
    if (accounts.isServiceEnabled(account.get(), platform::kSKServiceIDAccountSync)) {
        WL_LOG_AS(kFunction, "Sync upsell skipped because sync is already enabled");
        WLRecordSyncSetupSeen();
        return false;
    }
    if (!WLScreenLockRequiresPassword()) {
        WL_LOG_AS(kFunction, "Sync upsell skipped because screen lock is not enabled");
        WLRecordSyncSetupSeen();
        return false;
    }
    const WLPerUserState& state = WLPerUserState::currentPerUserState();
    if (!state.didSeeSyncSetup()) {
        return true;
    }
    if (state.didSeeSyncSetup2()) {
        return false;
    }
    WL_LOG_AS(kFunction, "Keychain Sync Cert Change");
    return true;
}

} // namespace welcomer
