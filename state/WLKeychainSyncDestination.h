// Whether keychain sync is set up during first-run setup, and which flow follows.

#pragma once

#include "state/SetupStateManager.h"

#include <cstdint>
#include <functional>
#include <optional>
#include <string>

namespace welcomer {

enum WLKeychainSyncDestination : std::int64_t {
    WLKeychainSyncDestinationCreateNSC = 0,    // no circle and nothing to recover: create a security code
    WLKeychainSyncDestinationJoinExisting = 1, // a circle exists: join it
    WLKeychainSyncDestinationVerifyNSC = 2,    // no circle, but a backup: recover with the security code
    WLKeychainSyncDestinationSkip = 3,         // keychain sync is skipped or was aborted
};

using WLKeychainSyncCallback = std::function<void(WLKeychainSyncDestination)>;

// Decides and, unless only checking, prepares the keychain for the flow that follows. A rule that skips
// keychain sync also sets the cloud setup manager's abort-sync flag, when only checking too.
//  checkOnly  whether to stop once no rule skips keychain sync
//  callback   not empty; called with the destination exactly once before this returns, but not at all when
//             only checking and no rule skips. Called with a refusal too, as WLKeychainSyncDestinationSkip.
//  result     whether keychain sync goes on
// Blocks for as long as the host's keychain operations take.
bool _WLDetermineKeychainSyncDestination( // a given name, although such names are reserved
    SetupStateManager& manager, bool checkOnly, const WLKeychainSyncCallback& callback);

// The same, not only checking.
bool WLDetermineKeychainSyncDestination(SetupStateManager& manager, const WLKeychainSyncCallback& callback);

// Whether a rule skips keychain sync; when one does, the abort-sync flag is set.
bool WLShouldSkipKeychainSync(SetupStateManager& manager);

// The name of the flow that a destination leads to, or none for WLKeychainSyncDestinationSkip and for what is
// no destination.
std::optional<std::string> WLKeychainSyncDestinationName(SetupStateManager& manager,
                                                         WLKeychainSyncDestination destination);

} // namespace welcomer
