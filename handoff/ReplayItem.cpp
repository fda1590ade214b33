#include "handoff/ReplayItem.h"

#include "log/PCLogManager.h"
#include "platform/Platform.h"
#include "propertylist/PropertyListReader.h"

#include <charconv>
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

platform::CredentialFinding findReplayItem(platform::CredentialWish wish) {
    return platform::current().credentialStore.findItem(kReplayItemService, kReplayItemAccount, wish);
}

// The one reader.
//  replayObject  where to put it, or null
bool read(platform::CredentialFinding& found, PropertyList* replayObject, bool wantsAttributes) {
    found = findReplayItem(platform::CredentialWish::Secret);
    if (!found) {
        WL_LOG(kReplayItemNotFoundMessage, found.status);
        return false;
    }
    if (replayObject && !deserializeReplayObject(found.secret, *replayObject)) {
        return false;
    }
    if (wantsAttributes && found.itemStatus != platform::kCredentialSuccess) {
        WL_LOG("Failed to get account name attribute");
        return false;
    }
    return true;
}

bool isDeleted(std::int32_t status) {
    if (status != platform::kCredentialSuccess) {
        WL_LOG("Failed to delete replay keychain item: %d", status);
        return false;
    }
    return true;
}

} // namespace

std::optional<std::int32_t> replayItemNotFoundStatus(std::string_view line) {
    constexpr std::string_view message = kReplayItemNotFoundMessage;
    constexpr std::string_view beginning = message.substr(0, message.find('%'));
    if (!line.starts_with(beginning)) {
        return std::nullopt;
    }
    line.remove_prefix(beginning.size());
    std::int32_t status = 0;
    const auto [end, error] = std::from_chars(line.data(), line.data() + line.size(), status);
    const bool isWhole = error == std::errc() && end == line.data() + line.size();
    return isWhole ? std::optional(status) : std::nullopt;
}

bool WLGetNimbusReplayKeychainItem(PropertyList* replayObject, std::string* accountName) {
    platform::CredentialFinding found;
    if (!read(found, replayObject, accountName != nullptr)) {
        return false;
    }
    if (accountName) {
        *accountName = std::move(found.item.label);
    }
    return true;
}

bool WLGetNimbusReplayKeychainItem(ReplayItem& found) {
    std::int32_t status = platform::kCredentialSuccess;
    return WLGetNimbusReplayKeychainItem(found, status);
}

bool WLGetNimbusReplayKeychainItem(ReplayItem& found, std::int32_t& status) {
    platform::CredentialFinding finding;
    PropertyList replayObject;
    const bool isRead = read(finding, &replayObject, true);
    status = finding.status;
    if (!isRead) {
        return false;
    }
    found = {std::move(replayObject), std::move(finding.item), std::move(finding.reference)};
    return true;
}

bool WLDeleteNimbusReplayKeychainItem() {
    std::int32_t status = platform::kCredentialSuccess;
    return WLDeleteNimbusReplayKeychainItem(status);
}

bool WLDeleteNimbusReplayKeychainItem(std::int32_t& status) {
    const platform::CredentialFinding found = findReplayItem(platform::CredentialWish::Item);
    status = found ? platform::current().credentialStore.deleteItem(*found.reference) : found.status;
    return isDeleted(status);
}

bool WLDeleteNimbusReplayKeychainItem(const ReplayItem& read) {
    return isDeleted(platform::current().credentialStore.deleteItem(*read.reference));
}

} // namespace welcomer
