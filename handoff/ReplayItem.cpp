#include "handoff/ReplayItem.h"

#include "log/PCLogManager.h"
#include "platform/Platform.h"
#include "propertylist/PropertyListReader.h"

#include <memory>
#include <utility>

namespace welcomer {

namespace {

using Reference = std::unique_ptr<platform::CredentialItemReference>;

// The replay item, or null; takes its data.
Reference findReplayItem(std::string& data) {
    Reference reference;
    const std::int32_t status = platform::current().credentialStore.findItem(
        kReplayItemService, kReplayItemAccount, &data, &reference);
    if (status != platform::kCredentialSuccess) {
        WL_LOG("Failed to find replay keychain item: %d", status);
        return nullptr;
    }
    return reference;
}

bool readItemAttributes(const platform::CredentialItemReference& reference, platform::CredentialItem& item) {
    if (platform::current().credentialStore.readAttributes(reference, item) != platform::kCredentialSuccess) {
        WL_LOG("Failed to get account name attribute");
        return false;
    }
    return true;
}

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
    std::string data;
    const Reference reference = findReplayItem(data);
    if (!reference || (replayObject && !deserializeReplayObject(data, *replayObject))) {
        return false;
    }
    if (!accountName) {
        return true;
    }
    platform::CredentialItem item;
    if (!readItemAttributes(*reference, item)) {
        return false;
    }
    *accountName = std::move(item.label);
    return true;
}

bool readReplayItem(ReplayItem& found) {
    std::string data;
    const Reference reference = findReplayItem(data);
    ReplayItem read;
    if (!reference || !deserializeReplayObject(data, read.replayObject) ||
        !readItemAttributes(*reference, read.item)) {
        return false;
    }
    read.store = reference->store();
    found = std::move(read);
    return true;
}

bool WLDeleteNimbusReplayKeychainItem() {
    platform::CredentialStore& store = platform::current().credentialStore;
    Reference reference;
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
