#include "backends/desktop/SearchListCredentialStore.h"

#include <cerrno>
#include <vector>

namespace welcomer::desktop {

namespace {

// What the stores have found, the newest first.
class Reference final : public platform::CredentialItemReference {
  public:
    struct Entry {
        platform::CredentialStore* store;
        std::unique_ptr<platform::CredentialItemReference> item;
    };

    explicit Reference(std::vector<Entry> entries) : _entries(std::move(entries)) {}

    platform::CredentialStoreDescription store() const override { return _entries.front().item->store(); }
    const std::vector<Entry>& entries() const { return _entries; }

  private:
    const std::vector<Entry> _entries;
};

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

// What one store has found, as far as it was wanted.
struct SearchListCredentialStore::Found {
    platform::CredentialStore* store = nullptr;
    std::string data;
    std::unique_ptr<platform::CredentialItemReference> reference;
};

std::int32_t SearchListCredentialStore::_askService(
    const std::function<std::int32_t(platform::CredentialStore&)>& question) {
    platform::CredentialStore* const service = _service.store();
    const std::int32_t status = service ? question(*service) : platform::kCredentialNoBus;
    const std::lock_guard lock(_mutex);
    _hasServed = _hasServed || (status != platform::kCredentialNoService &&
                                !platform::credentialServiceWasNotAsked(status));
    return status;
}

// Whether a status says that there is no service at all.
bool SearchListCredentialStore::_isWithoutService(std::int32_t status) {
    if (status == platform::kCredentialNoService) {
        return true;
    }
    if (status != platform::kCredentialNoBus && status != platform::kCredentialBusDied) {
        return false;
    }
    {
        const std::lock_guard lock(_mutex);
        if (_hasServed) {
            return false;
        }
    }
    return !_service.isSomewhere();
}

std::int32_t SearchListCredentialStore::createItem(const platform::CredentialItem& item,
                                                   const std::string& data) {
    const posix::FileLock lock = _lock();
    if (!lock) {
        return lock.error().number == ETIMEDOUT ? platform::kCredentialStoreInUse
                                                : platform::kCredentialWriteFailed;
    }
    // The service itself refuses what it holds. A local store that cannot be read says so when it is written.
    if (_local.findItem(item.service, item.account, nullptr, nullptr) == platform::kCredentialSuccess) {
        return platform::kCredentialDuplicateItem;
    }
    const bool isForService = _newItems == NewItems::ToTheService;
    const std::int32_t status = _askService([&](platform::CredentialStore& service) {
        return isForService ? service.createItem(item, data)
                            : service.findItem(item.service, item.account, nullptr, nullptr);
    });
    if (isForService) {
        return _isWithoutService(status) ? _local.createItem(item, data) : status;
    }
    return status == platform::kCredentialSuccess
               ? static_cast<std::int32_t>(platform::kCredentialDuplicateItem)
               : _local.createItem(item, data);
}

std::int32_t
SearchListCredentialStore::findItem(const std::string& service, const std::string& account, std::string* data,
                                    std::unique_ptr<platform::CredentialItemReference>* reference) {
    const Key key(service, account);
    // Which of two is the newest is seen by the references.
    const bool wantsReference = data || reference;
    Found local;
    Found desktop;
    const std::int32_t localStatus = _look(_local, key, data != nullptr, wantsReference, local);
    const bool isEnough = localStatus == platform::kCredentialSuccess && !data && _wasReadLocally(key);
    const std::int32_t status = isEnough
                                    ? static_cast<std::int32_t>(platform::kCredentialItemNotFound)
                                    : _askService([&](platform::CredentialStore& store) {
                                          return _look(store, key, data != nullptr, wantsReference, desktop);
                                      });
    std::vector<Found> found;
    if (status == platform::kCredentialSuccess) {
        found.push_back(std::move(desktop));
    }
    if (localStatus == platform::kCredentialSuccess) {
        found.push_back(std::move(local));
    }
    if (found.empty()) {
        return status == platform::kCredentialItemNotFound || _isWithoutService(status) ? localStatus
                                                                                        : status;
    }
    if (found.size() == 2 && wantsReference && _changed(found[1]) > _changed(found[0])) {
        std::swap(found[0], found[1]);
    }
    if (data) {
        *data = std::move(found.front().data);
        _noteReadLocally(key, status != platform::kCredentialSuccess &&
                                  status != platform::kCredentialItemNotFound);
    }
    if (reference) {
        std::vector<Reference::Entry> entries;
        entries.reserve(found.size());
        for (Found& each : found) {
            entries.push_back({each.store, std::move(each.reference)});
        }
        *reference = std::make_unique<Reference>(std::move(entries));
    }
    return platform::kCredentialSuccess;
}

std::int32_t SearchListCredentialStore::_look(platform::CredentialStore& store, const Key& key,
                                              bool wantsData, bool wantsReference, Found& found) {
    found.store = &store;
    return store.findItem(key.first, key.second, wantsData ? &found.data : nullptr,
                          wantsReference ? &found.reference : nullptr);
}

// What cannot be looked at is the oldest.
std::int64_t SearchListCredentialStore::_changed(const Found& found) {
    platform::CredentialItem item;
    return found.store->readAttributes(*found.reference, item) == platform::kCredentialSuccess ? item.changed
                                                                                               : 0;
}

void SearchListCredentialStore::_noteReadLocally(const Key& key, bool wasReadLocally) {
    const std::lock_guard lock(_mutex);
    if (wasReadLocally) {
        _readLocally.insert(key);
    } else {
        _readLocally.erase(key);
    }
}

bool SearchListCredentialStore::_wasReadLocally(const Key& key) {
    const std::lock_guard lock(_mutex);
    return _readLocally.contains(key);
}

std::int32_t SearchListCredentialStore::readAttributes(const platform::CredentialItemReference& reference,
                                                       platform::CredentialItem& item) {
    const auto& found = dynamic_cast<const Reference&>(reference).entries().front();
    return found.store->readAttributes(*found.item, item);
}

std::int32_t SearchListCredentialStore::deleteItem(const platform::CredentialItemReference& reference) {
    std::int32_t result = platform::kCredentialItemNotFound;
    for (const Reference::Entry& found : dynamic_cast<const Reference&>(reference).entries()) {
        const std::int32_t status = found.store->deleteItem(*found.item);
        const bool isFirst = result == platform::kCredentialItemNotFound;
        const bool isFailure =
            status != platform::kCredentialSuccess && status != platform::kCredentialItemNotFound;
        // A failure says that an item is left; what has gone meanwhile is as good as deleted.
        if (isFirst || (isFailure && result == platform::kCredentialSuccess)) {
            result = status;
        }
    }
    return result;
}

} // namespace welcomer::desktop
