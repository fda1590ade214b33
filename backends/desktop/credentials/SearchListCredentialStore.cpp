#include "backends/desktop/credentials/SearchListCredentialStore.h"

#include <cerrno>
#include <utility>
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

    //  other  without an item where there is but one
    Reference(Entry newest, Entry other) {
        _entries.push_back(std::move(newest));
        if (other.item) {
            _entries.push_back(std::move(other));
        }
    }

    platform::CredentialStoreDescription store() const override { return _entries.front().item->store(); }
    const std::vector<Entry>& entries() const { return _entries; }

  private:
    std::vector<Entry> _entries;
};

// When the store last changed what it has found. What cannot be looked at is the oldest.
std::int64_t changed(const platform::CredentialFinding& found) {
    return found.itemStatus == platform::kCredentialSuccess ? found.item.changed : 0;
}

} // namespace

// What the service says, or why it cannot be asked.
template <class Question>
auto SearchListCredentialStore::_askService(const Question& question)
    -> decltype(question(std::declval<platform::CredentialStore&>())) {
    platform::CredentialStore* const service = _service.store();
    decltype(question(*service)) answer;
    answer.status = platform::kCredentialNoBus;
    if (service) {
        answer = question(*service);
    }
    const std::lock_guard lock(_mutex);
    _hasServed = _hasServed || (answer.status != platform::kCredentialNoService &&
                                !platform::credentialServiceWasNotAsked(answer.status));
    return answer;
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

platform::CredentialOutcome SearchListCredentialStore::createItem(const platform::CredentialItem& item,
                                                                  const std::string& data) {
    using platform::CredentialWish;
    const posix::FileLock lock = _lock();
    if (!lock) {
        return {lock.error().number == ETIMEDOUT ? platform::kCredentialStoreInUse
                                                 : platform::kCredentialWriteFailed,
                lock.error().message};
    }
    // The service itself refuses what it holds. A local store that cannot be read says so when it is written.
    if (_local.findItem(item.service, item.account, CredentialWish::Presence)) {
        return {platform::kCredentialDuplicateItem};
    }
    if (_newItems == NewItems::ToTheService) {
        platform::CredentialOutcome outcome =
            _askService([&](platform::CredentialStore& service) { return service.createItem(item, data); });
        return _isWithoutService(outcome.status) ? _local.createItem(item, data) : outcome;
    }
    const bool isThere = static_cast<bool>(_askService([&](platform::CredentialStore& service) {
        return service.findItem(item.service, item.account, CredentialWish::Presence);
    }));
    return isThere ? platform::CredentialOutcome{platform::kCredentialDuplicateItem}
                   : _local.createItem(item, data);
}

platform::CredentialFinding SearchListCredentialStore::findItem(const std::string& service,
                                                                const std::string& account,
                                                                platform::CredentialWish wish) {
    platform::CredentialFinding local = _local.findItem(service, account, wish);
    platform::CredentialFinding found =
        _askService([&](platform::CredentialStore& store) { return store.findItem(service, account, wish); });
    if (!found && !local) {
        return found.status == platform::kCredentialItemNotFound || _isWithoutService(found.status)
                   ? std::move(local)
                   : std::move(found);
    }
    Reference::Entry ofService{_service.store(), std::move(found.reference)};
    Reference::Entry ofLocal{&_local, std::move(local.reference)};
    if (!found || (local && changed(local) > changed(found))) {
        found = std::move(local);
        std::swap(ofService, ofLocal);
    }
    if (ofService.item) {
        found.reference = std::make_unique<Reference>(std::move(ofService), std::move(ofLocal));
    }
    return found;
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
