#include "state/WLRecordSetupSeen.h"

#include "platform/Platform.h"
#include "state/WLPerUserState.h"

namespace welcomer {

void WLRecordCloudSetupSeen() {
    WLPerUserState& state = WLPerUserState::currentPerUserState();
    state.setDidSeeCloudSetup(true);
    state.setLastSeenCloudProductVersion(platform::current().systemVersionInfo.productVersion());
}

void WLRecordSyncSetupSeen() {
    WLPerUserState& state = WLPerUserState::currentPerUserState();
    state.setDidSeeSyncSetup(true);
    state.setDidSeeSyncSetup2(true);
    state.setLastSeenSyncProductVersion(platform::current().systemVersionInfo.productVersion());
}

} // namespace welcomer
