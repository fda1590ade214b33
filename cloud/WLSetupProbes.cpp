#include "cloud/WLSetupProbes.h"

#include "log/PCLogManager.h"
#include "platform/Path.h"
#include "platform/Platform.h"
#include "propertylist/PropertyListReadings.h"

#include <exception>
#include <optional>

namespace welcomer {

namespace {

constexpr char kScreensaverDomain[] = "com.corvid.screensaver";
constexpr char kAskForPasswordKey[] = "askForPassword";
constexpr char kLogDelegateResponsesDefault[] = "WLLogDelegateResponses";
constexpr char kTransitionTool[] = "/usr/libexec/transition";
constexpr char kHardwareWarrantyMarker[] = "/var/db/.ShowHardwareWarranty";

std::optional<bool> screenLockOverride;
bool hardwareWarrantyMarkerSeen = false;

} // namespace

bool WLScreenLockRequiresPassword() {
    if (screenLockOverride) {
        return *screenLockOverride;
    }
    return booleanReading(
        platform::current().preferenceStore.copyValue(kAskForPasswordKey, kScreensaverDomain));
}

void WLSetScreenLockRequiresPasswordOverride(bool value) {
    screenLockOverride = value;
}

bool WLShouldLogDelegateResponses() {
    const platform::Platform& platform = platform::current();
    if (platform.preferenceStore.booleanDefault(kLogDelegateResponsesDefault)) {
        return true;
    }
    static_cast<void>(platform.fileSystem.exists(platform::kInternalMarker)); // looked at, never heeded
    return true;
}

void WLCallTesselFinishedSetup() {
    WL_LOG("WLCallTesselFinishedSetup");
    platform::current().accountService.sharedManager().markSetupFinished(std::nullopt);
}

bool WLRunTransitionTool() {
    try {
        platform::current().processLauncher.launchAndWait(kTransitionTool, {});
    } catch (const std::exception& exception) {
        WL_LOG("Failed to exec transition tool: %@", exception);
        return false;
    }
    WL_LOG("Ran transition tool");
    return true;
}

bool WLShouldShowHardwareWarranty() {
    if (!hardwareWarrantyMarkerSeen) {
        hardwareWarrantyMarkerSeen = platform::current().fileSystem.exists(kHardwareWarrantyMarker);
    }
    return hardwareWarrantyMarkerSeen;
}

void WLRemoveHardwareWarrantyMarker() {
    static_cast<void>(platform::current().fileSystem.remove(kHardwareWarrantyMarker));
}

} // namespace welcomer
