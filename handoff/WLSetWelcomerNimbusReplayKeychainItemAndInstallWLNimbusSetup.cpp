#include "handoff/WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup.h"

#include "handoff/LaunchAgentFile.h"
#include "handoff/ReplayItem.h"
#include "log/PCLogManager.h"
#include "platform/Platform.h"
#include "propertylist/PropertyListWriter.h"

#include <cerrno>
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

// The user's home; throws where there is none. The platform makes the library folder in a new home, which is
// asked for its effect: here only the folder in it is made.
std::string homeWithLibrary() {
    platform::ProcessIdentity& identity = platform::current().processIdentity;
    identity.userLibraryDirectories();
    return identity.homeDirectory();
}

bool installLaunchAgent(platform::ResourceBundle& bundle) {
    const platform::Platform& platform = platform::current();
    const std::optional<std::string> resource =
        bundle.pathForResource(kLaunchAgentLabel, kLaunchAgentFileType);
    const std::string home = homeWithLibrary();
    const std::string folder = launchAgentsFolder(home);
    if (!platform.fileSystem.exists(folder)) {
        const platform::Outcome created = platform.fileSystem.createDirectory(folder, 0755);
        if (!created && created.error.number != EEXIST) {
            WL_LOG("failed to create %@: %@", folder, created.error);
            return false;
        }
    }
    const platform::Outcome installed =
        resource ? platform.fileSystem.copy(*resource, launchAgentPath(home))
                 : platform::Outcome::failure({ENOENT, "the bundle has no launch-agent file"});
    if (!installed) {
        WL_LOG("failed to install com.corvid.welcomer.nimbussetup: %@", installed.error);
        return false;
    }
    return true;
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
    if (stored != platform::kCredentialSuccess) {
        return false;
    }
    try {
        return installLaunchAgent(bundle);
    } catch (const platform::Exception& exception) { // the user has no home
        WL_LOG("failed to install com.corvid.welcomer.nimbussetup: %@", exception);
        return false;
    }
}

} // namespace welcomer
