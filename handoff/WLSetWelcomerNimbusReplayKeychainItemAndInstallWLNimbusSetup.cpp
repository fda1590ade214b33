#include "handoff/WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup.h"

#include "handoff/LaunchAgentFile.h"
#include "handoff/LaunchAgentInstaller.h"
#include "handoff/ReplayItem.h"
#include "log/PCLogManager.h"
#include "platform/Platform.h"
#include "propertylist/PropertyListWriter.h"

#include <optional>

namespace welcomer {

namespace {

// Lets the agent, and nothing else, read the item without a prompt. None: the store's default access.
std::optional<platform::CredentialAccess> createAgentAccess(platform::ResourceBundle& bundle) {
    const std::optional<std::string> agent = bundle.pathForResource(kAgentProgramName, "");
    if (!agent) {
        return std::nullopt;
    }
    platform::CredentialStore& store = platform::current().credentialStore;
    platform::TrustedApplication application;
    std::int32_t status = store.createTrustedApplication(*agent, application);
    if (status != platform::kCredentialSuccess) {
        WL_LOG("Failed to create trusted app for replay keychain item: %d", status);
        return std::nullopt;
    }
    platform::CredentialAccess access;
    status = store.createAccess("Welcomer Nimbus Access", {application}, access);
    if (status != platform::kCredentialSuccess) {
        WL_LOG("Failed to create access ref for replay keychain item: %d", status);
        return std::nullopt;
    }
    return access;
}

platform::CredentialOutcome storeReplayItem(const std::string& accountName, const PropertyList& replayObject,
                                            platform::ResourceBundle& bundle) {
    const platform::CredentialItem item{kReplayItemService, kReplayItemAccount, accountName,
                                        createAgentAccess(bundle)};
    const std::string data = writeXMLPropertyList(replayObject).value_or(std::string());
    platform::CredentialOutcome outcome = platform::current().credentialStore.createItem(item, data);
    if (outcome == platform::kCredentialSuccess) {
        WL_LOG("Stored %lub replay data in user keychain", data.size());
    } else {
        WL_LOG("Failed to create replay keychain item: %d", outcome.status);
    }
    return outcome;
}

} // namespace

bool WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup(const std::string& accountName,
                                                                  const PropertyList& replayObject,
                                                                  platform::ResourceBundle& bundle) {
    platform::CredentialOutcome stored;
    return WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup(accountName, replayObject, bundle,
                                                                        stored);
}

bool WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup(const std::string& accountName,
                                                                  const PropertyList& replayObject,
                                                                  platform::ResourceBundle& bundle,
                                                                  platform::CredentialOutcome& stored) {
    stored = storeReplayItem(accountName, replayObject, bundle);
    return stored == platform::kCredentialSuccess && installLaunchAgent(bundle);
}

} // namespace welcomer
