#include "handoff/ReplayItem.h"

#include "log/PCLogManager.h"
#include "platform/Platform.h"
#include "propertylist/PropertyListReader.h"

#include <memory>
#include <utility>

namespace welcomer {

namespace {

// Writes to `object` on success only.
bool deserializeReplayObject(const std::string& data, PropertyList& object) {
    PropertyListReadResult read = readPropertyList(data);
    if (!read) {
        WL_LOG("Failed to deserialize replayable data length: %@", read.error);
        return false;
    }
    object = std::move(*read.value);
    return true;
}

} // namespace

bool WLGetNimbusReplayKeychainItem(PropertyList* replayObject, std::string* accountName) {
    platform::CredentialStore& store = platform::current().credentialStore;
    std::string data;
    std::unique_ptr<platform::CredentialItemReference> reference;
    const std::int32_t status = store.findItem(kReplayItemService, kReplayItemAccount, &data, &reference);
    if (status != platform::kCredentialSuccess) {
        WL_LOG("Failed to find replay keychain item: %d", status);
        return false;
    }
    if (replayObject && !deserializeReplayObject(data, *replayObject)) {
        return false;
    }
    if (!accountName) {
        return true;
    }
    platform::CredentialItem item;
    if (store.readAttributes(*reference, item) != platform::kCredentialSuccess) {
        WL_LOG("Failed to get account name attribute");
        return false;
    }
    *accountName = std::move(item.label);
    return true;
}

bool WLDeleteNimbusReplayKeychainItem() {
    platform::CredentialStore& store = platform::current().credentialStore;
    std::unique_ptr<platform::CredentialItemReference> reference;
    std::int32_t status = store.findItem(kReplayItemService, kReplayItemAccount, nullptr, &reference);
    if (status == platform::kCredentialSuccess) {
        status = store.deleteItem(*reference);
    }
    if (status != platform::kCredentialSuccess) {
        WL_LOG("Failed to delete replay keychain item: %d", status);
        return false;
    }
    return true;
}

} // namespace welcomer
