#include "tests/fakes/FakeCredentialStore.h"

#include "platform/KeyedItemReference.h"

#include <algorithm>
#include <utility>

namespace welcomer::fakes {

std::int32_t FakeCredentialStore::statusOf(Operation operation) const {
    const auto found = _statuses.find(operation);
    return found == _statuses.end() ? platform::kCredentialSuccess : found->second;
}

std::vector<FakeCredentialStore::StoredItem>::iterator FakeCredentialStore::find(const std::string& service,
                                                                                 const std::string& account) {
    return std::find_if(_items.begin(), _items.end(), [&](const StoredItem& stored) {
        return stored.item.service == service && stored.item.account == account;
    });
}

std::int32_t FakeCredentialStore::createTrustedApplication(const std::string& path,
                                                           platform::TrustedApplication& application) {
    _recorder.record("CredentialStore.createTrustedApplication " + path);
    const std::lock_guard lock(_mutex);
    if (const std::int32_t status = statusOf(Operation::CreateTrustedApplication)) {
        return status;
    }
    return CredentialStore::createTrustedApplication(path, application);
}

std::int32_t FakeCredentialStore::createAccess(const std::string& description,
                                               std::vector<platform::TrustedApplication> trustedApplications,
                                               platform::CredentialAccess& access) {
    _recorder.record("CredentialStore.createAccess " + description);
    const std::lock_guard lock(_mutex);
    if (const std::int32_t status = statusOf(Operation::CreateAccess)) {
        return status;
    }
    return CredentialStore::createAccess(description, std::move(trustedApplications), access);
}

platform::CredentialOutcome FakeCredentialStore::createItem(const platform::CredentialItem& item,
                                                            const std::string& data) {
    _recorder.record("CredentialStore.createItem " + item.service + ", " + item.account);
    const std::lock_guard lock(_mutex);
    if (const std::int32_t status = statusOf(Operation::CreateItem)) {
        return {status, detail};
    }
    if (find(item.service, item.account) != _items.end()) {
        return {platform::kCredentialDuplicateItem};
    }
    _items.push_back({item, data});
    return {};
}

platform::CredentialFinding FakeCredentialStore::findItem(const std::string& service,
                                                          const std::string& account,
                                                          platform::CredentialWish wish) {
    _recorder.record("CredentialStore.findItem " + service + ", " + account);
    const std::lock_guard lock(_mutex);
    platform::CredentialFinding result;
    result.status = statusOf(Operation::FindItem);
    const auto found = find(service, account);
    if (result && found == _items.end()) {
        result.status = platform::kCredentialItemNotFound;
    }
    if (!result || wish == platform::CredentialWish::Presence) {
        return result;
    }
    result.reference = std::make_unique<platform::KeyedItemReference>(
        platform::CredentialStoreDescription{"memory", "this process alone"}, service, account);
    result.itemStatus = statusOf(Operation::ReadAttributes);
    if (result.itemStatus == platform::kCredentialSuccess) {
        result.item = found->item;
    }
    if (wish == platform::CredentialWish::Secret) {
        ++_dataReads;
        result.secret = found->data;
    }
    return result;
}

std::int32_t FakeCredentialStore::deleteItem(const platform::CredentialItemReference& reference) {
    const auto& key = dynamic_cast<const platform::KeyedItemReference&>(reference);
    _recorder.record("CredentialStore.deleteItem " + key.service() + ", " + key.account());
    const std::lock_guard lock(_mutex);
    if (const std::int32_t status = statusOf(Operation::DeleteItem)) {
        return status;
    }
    const auto found = find(key.service(), key.account());
    if (found == _items.end()) {
        return platform::kCredentialItemNotFound;
    }
    _items.erase(found);
    return platform::kCredentialSuccess;
}

int FakeCredentialStore::dataReads() const {
    const std::lock_guard lock(_mutex);
    return _dataReads;
}

std::vector<FakeCredentialStore::StoredItem> FakeCredentialStore::items() const {
    const std::lock_guard lock(_mutex);
    return _items;
}

void FakeCredentialStore::put(const platform::CredentialItem& item, const std::string& data) {
    const std::lock_guard lock(_mutex);
    const auto found = find(item.service, item.account);
    if (found == _items.end()) {
        _items.push_back({item, data});
    } else {
        *found = {item, data};
    }
}

void FakeCredentialStore::setStatus(Operation operation, std::int32_t status) {
    const std::lock_guard lock(_mutex);
    _statuses[operation] = status;
}

} // namespace welcomer::fakes
