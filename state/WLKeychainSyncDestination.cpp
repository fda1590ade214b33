#include "state/WLKeychainSyncDestination.h"

#include "cloud/WLSetupProbes.h"
#include "log/PCLogManager.h"
#include "platform/Platform.h"
#include "propertylist/PropertyListReadings.h"

namespace welcomer {

namespace {

constexpr char kFunction[] = "BOOL _WLDetermineKeychainSyncDestination(SetupStateManager *, BOOL, void "
                             "(^)(WLKeychainSyncDestination))";

constexpr char kFakeComplexRecoveryMarker[] = "/var/db/.WLFakeComplexRecovery";

constexpr std::int64_t kNoCircle = 0;
constexpr std::int64_t kCircleExists = 1;
constexpr std::int64_t kUnknownCircle = -1; // any number that is none of the above

bool screenLockIsSecured(SetupStateManager& manager) {
    return manager.isMiniGreeter() ? WLScreenLockRequiresPassword()
                                   : manager.localUserAccountManager().secureMyDesk();
}

// Whether one of the rules skips keychain sync; the first that does is logged.
bool isSkippedByRule(SetupStateManager& manager) {
    if (!screenLockIsSecured(manager)) {
        WL_LOG_AS(kFunction, "Keychain Sync was skipped because of screen lock setting.");
        return true;
    }
    // NOLINTNEXTLINE(readability-static-accessed-through-instance): the host's own manager is the one to ask
    if (!manager.networkingManager().internetIsReachable()) {
        WL_LOG_AS(kFunction, "Keychain Sync was skipped because the internet is not reachable.");
        return true;
    }
    CloudSetupManager& cloud = manager.NimbusManager();
    if (cloud.creating() && !cloud.hasCorvidProvidedID()) {
        WL_LOG_AS(kFunction, "Keychain Sync was skipped because we are creating a new Nimbus account.");
        return true;
    }
    if (!manager.isKeychainUpsellGreeter() && (cloud.abortSetup() || !cloud.mainAccountResponseDict())) {
        WL_LOG_AS(kFunction, "Keychain Sync was skipped because Nimbus was skipped"); // no full stop here
        return true;
    }
    return false;
}

// Prepares the keychain.
//  result  whether its components are initialised
bool prepareKeychain(SetupStateManager& manager) {
    WLLoginHelper& helper = manager.wlloginhelper();
    if (!manager.isMiniGreeter()) {
        LocalUserAccountManager& user = manager.localUserAccountManager();
        const auto userName = user.userName();
        const auto password = user.password();
        helper.createKeychain(userName, password);
    }
    CloudSetupManager& cloud = manager.NimbusManager();
    const auto userName = cloud.username();
    const auto password = cloud.password();
    const auto response = cloud.mainAccountResponseDict();
    helper.configureNimbusAccountForKeychainSyncKVSPasswordBag(userName, password, response);
    // Asked again, as for each message to the helper: configuring may have changed them.
    const auto seedName = cloud.username();
    const auto seedPassword = cloud.password();
    return helper.seedKeychainComponentsWithIDPassword(seedName, seedPassword);
}

// A missing status says that there is no circle; one that is no number says nothing that is known.
std::int64_t circleStatus(WLLoginHelper& helper) {
    const auto answer = helper.queryKeychainSyncStatus(std::nullopt);
    if (!answer || !answer->contains("status")) {
        return kNoCircle;
    }
    return integerIn(answer->at("status")).value_or(kUnknownCircle);
}

// Where to go when no circle exists.
WLKeychainSyncDestination destinationWithoutCircle(CloudSetupManager& cloud) {
    WL_LOG_AS(kFunction, "There is no existing circle, so we should recover if possible");
    if (!cloud.backupIsEnabled()) {
        WL_LOG_AS(kFunction, "Backup is NOT enabled, so we can't recover");
        return WLKeychainSyncDestinationCreateNSC;
    }
    WL_LOG_AS(kFunction, "Backup is enabled, so we should recover");
    cloud.setIsBackupNoCircleRecovery(true);
    return WLKeychainSyncDestinationVerifyNSC;
}

// Prepares the keychain and finds out where to go.
WLKeychainSyncDestination prepareAndDetermine(SetupStateManager& manager) {
    CloudSetupManager& cloud = manager.NimbusManager();
    if (!prepareKeychain(manager)) {
        WL_LOG_AS(kFunction, "Aborting Keychain Sync because components failed to initialize");
        cloud.setAbortSyncSetup(true);
        return WLKeychainSyncDestinationSkip;
    }
    if (cloud.abortSetup()) {
        return WLKeychainSyncDestinationSkip; // the user's own doing: neither logged nor flagged
    }
    WLLoginHelper& helper = manager.wlloginhelper();
    const std::int64_t status = circleStatus(helper);
    cloud.setBackupIsEnabled(helper.isBackupEnabled());
    switch (status) {
    case kCircleExists:
        return WLKeychainSyncDestinationJoinExisting;
    case kNoCircle:
        return destinationWithoutCircle(cloud);
    default:
        return WLKeychainSyncDestinationSkip; // neither logged nor flagged
    }
}

} // namespace

bool _WLDetermineKeychainSyncDestination(SetupStateManager& manager, bool checkOnly,
                                         const WLKeychainSyncCallback& callback) {
    if (isSkippedByRule(manager)) {
        manager.NimbusManager().setAbortSyncSetup(true);
        callback(WLKeychainSyncDestinationSkip);
        return false;
    }
    if (checkOnly) {
        return true;
    }
    const WLKeychainSyncDestination destination = prepareAndDetermine(manager);
    callback(destination);
    return destination != WLKeychainSyncDestinationSkip;
}

bool WLDetermineKeychainSyncDestination(SetupStateManager& manager, const WLKeychainSyncCallback& callback) {
    return _WLDetermineKeychainSyncDestination(manager, false, callback);
}

bool WLShouldSkipKeychainSync(SetupStateManager& manager) {
    return !_WLDetermineKeychainSyncDestination(manager, true, [](WLKeychainSyncDestination) {});
}

std::optional<std::string> WLKeychainSyncDestinationName(SetupStateManager& manager,
                                                         WLKeychainSyncDestination destination) {
    switch (destination) {
    case WLKeychainSyncDestinationCreateNSC:
        return "NimbusKeychainCreateNSC";
    case WLKeychainSyncDestinationJoinExisting:
        return "NimbusKeychainJoinExisting";
    case WLKeychainSyncDestinationVerifyNSC: {
        const bool isComplex = manager.wlloginhelper().escrowUsesComplexPasscode();
        // The marker forces the complex flow on purpose.
        const bool isForced = platform::current().fileSystem.exists(kFakeComplexRecoveryMarker);
        return isForced || isComplex ? "NimbusKeychainVerifyComplexNSCRecovery" : "NimbusKeychainVerifyNSC";
    }
    default:
        return std::nullopt;
    }
}

} // namespace welcomer
