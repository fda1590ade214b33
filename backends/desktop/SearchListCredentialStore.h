// Two credential stores as one: the desktop's service, with the local store behind it.

#pragma once

#include "backends/local/FileLock.h"
#include "platform/CredentialStore.h"

#include <functional>
#include <map>
#include <mutex>
#include <string>
#include <utility>

namespace welcomer::desktop {

// Without a bus or a service the local store serves alone. Otherwise items are created by the service; they
// are found in either, the service's first. What the service cannot do for another reason (a locked keyring,
// a refusal, a secret too large) it says with a status of its own, unless the local store holds the item that
// is wanted.
//
// Creating an item holds a lock of the user, because the service itself replaces silently, or makes a
// second item: of two writers at once one succeeds, and the other learns of the duplicate.
class SearchListCredentialStore final : public platform::CredentialStore {
  public:
    //  service  gives the service's store, borrowed, or null where there is none; asked at each operation
    //  local    borrowed
    //  lock     takes the lock of this user; asked when an item is created
    SearchListCredentialStore(std::function<platform::CredentialStore*()> service,
                              platform::CredentialStore& local, std::function<local::FileLock()> lock)
        : _service(std::move(service)),
          _local(local),
          _lock(std::move(lock)) {}

    std::int32_t createTrustedApplication(const std::string& path,
                                          platform::TrustedApplication& application) override;
    std::int32_t createAccess(const std::string& description,
                              std::vector<platform::TrustedApplication> trustedApplications,
                              platform::CredentialAccess& access) override;
    std::int32_t createItem(const platform::CredentialItem& item, const std::string& data) override;
    std::int32_t findItem(const std::string& service, const std::string& account, std::string* data,
                          std::unique_ptr<platform::CredentialItemReference>* reference) override;
    std::int32_t readAttributes(const platform::CredentialItemReference& reference,
                                platform::CredentialItem& item) override;
    std::int32_t deleteItem(const platform::CredentialItemReference& reference) override;

  private:
    using Key = std::pair<std::string, std::string>; // service and account

    std::int32_t _find(platform::CredentialStore* store, const Key& key, std::string* data,
                       std::unique_ptr<platform::CredentialItemReference>* reference);
    void _noteRead(const Key& key, platform::CredentialStore* store);
    bool _wasReadLocally(const Key& key);

    const std::function<platform::CredentialStore*()> _service;
    platform::CredentialStore& _local;
    const std::function<local::FileLock()> _lock;
    std::mutex _mutex;
    // Where each item's secret was last read: what is then looked up to be deleted is that item, and no
    // other.
    std::map<Key, platform::CredentialStore*> _readFrom;
};

} // namespace welcomer::desktop
