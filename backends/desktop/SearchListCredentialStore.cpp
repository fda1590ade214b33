#include "backends/desktop/SearchListCredentialStore.h"

#include <cerrno>

namespace welcomer::desktop {

namespace {

// What one of the stores found.
class Reference final : public platform::CredentialItemReference {
  public:
    Reference(platform::CredentialStore& store, std::unique_ptr<platform::CredentialItemReference> item)
        : _store(store),
          _item(std::move(item)) {}

    platform::CredentialStoreDescription store() const override { return _item->store(); }
    platform::CredentialStore& foundBy() const { return _store; }
    const platform::CredentialItemReference& item() const { return *_item; }

  private:
    platform::CredentialStore& _store;
    const std::unique_ptr<platform::CredentialItemReference> _item;
};

// Whether a status of the service says that there is none, or none with such an item.
bool leavesItToTheLocalStore(std::int32_t status) {
    return status == platform::kCredentialItemNotFound || status == platform::kCredentialNoService ||
           status == platform::kCredentialNoBus;
}

} // namespace

std::int32_t SearchListCredentialStore::createTrustedApplication(const std::string& path,
                                                                 platform::TrustedApplication& application) {
    return _local.createTrustedApplication(path, application);
}

std::int32_t
SearchListCredentialStore::createAccess(const std::string& description,
                                        std::vector<platform::TrustedApplication> trustedApplications,
                                        platform::CredentialAccess& access) {
    return _local.createAccess(description, std::move(trustedApplications), access);
}

std::int32_t SearchListCredentialStore::createItem(const platform::CredentialItem& item,
                                                   const std::string& data) {
    const local::FileLock lock = _lock();
    if (!lock) {
        return lock.error().number == ETIMEDOUT ? platform::kCredentialStoreInUse
                                                : platform::kCredentialWriteFailed;
    }
    // The service itself refuses what it holds. A local store that cannot be read says so when it is written.
    if (_local.findItem(item.service, item.account, nullptr, nullptr) == platform::kCredentialSuccess) {
        return platform::kCredentialDuplicateItem;
    }
    platform::CredentialStore* const service = _service();
    const std::int32_t status = service ? service->createItem(item, data) : platform::kCredentialNoService;
    return leavesItToTheLocalStore(status) ? _local.createItem(item, data) : status;
}

std::int32_t
SearchListCredentialStore::findItem(const std::string& service, const std::string& account, std::string* data,
                                    std::unique_ptr<platform::CredentialItemReference>* reference) {
    const Key key(service, account);
    if (!data && _wasReadLocally(key) &&
        _find(&_local, key, nullptr, reference) == platform::kCredentialSuccess) {
        return platform::kCredentialSuccess;
    }
    platform::CredentialStore* const desktop = _service();
    const std::int32_t status =
        desktop ? _find(desktop, key, data, reference) : platform::kCredentialNoService;
    if (status == platform::kCredentialSuccess) {
        return status;
    }
    const std::int32_t localStatus = _find(&_local, key, data, reference);
    return localStatus == platform::kCredentialSuccess || leavesItToTheLocalStore(status) ? localStatus
                                                                                          : status;
}

std::int32_t SearchListCredentialStore::_find(platform::CredentialStore* store, const Key& key,
                                              std::string* data,
                                              std::unique_ptr<platform::CredentialItemReference>* reference) {
    std::unique_ptr<platform::CredentialItemReference> found;
    const std::int32_t status = store->findItem(key.first, key.second, data, reference ? &found : nullptr);
    if (status == platform::kCredentialSuccess) {
        if (reference) {
            *reference = std::make_unique<Reference>(*store, std::move(found));
        }
        if (data) {
            _noteRead(key, store);
        }
    }
    return status;
}

void SearchListCredentialStore::_noteRead(const Key& key, platform::CredentialStore* store) {
    const std::lock_guard lock(_mutex);
    _readFrom[key] = store;
}

bool SearchListCredentialStore::_wasReadLocally(const Key& key) {
    const std::lock_guard lock(_mutex);
    const auto found = _readFrom.find(key);
    return found != _readFrom.end() && found->second == &_local;
}

std::int32_t SearchListCredentialStore::readAttributes(const platform::CredentialItemReference& reference,
                                                       platform::CredentialItem& item) {
    const auto& found = dynamic_cast<const Reference&>(reference);
    return found.foundBy().readAttributes(found.item(), item);
}

std::int32_t SearchListCredentialStore::deleteItem(const platform::CredentialItemReference& reference) {
    const auto& found = dynamic_cast<const Reference&>(reference);
    return found.foundBy().deleteItem(found.item());
}

} // namespace welcomer::desktop
