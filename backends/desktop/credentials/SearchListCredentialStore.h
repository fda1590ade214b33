// Two credential stores as one: the desktop's service, with the local store behind it.

#pragma once

#include "backends/posix/FileLock.h"
#include "platform/CredentialStore.h"

#include <cstdint>
#include <functional>
#include <mutex>
#include <string>
#include <utility>

namespace welcomer::desktop {

// Where there is no service at all the local store serves alone. Otherwise items are created by the service;
// they are looked for in both. Where both have one, the newest is read (the service's, when they are of one
// second), and both are deleted. What the service cannot do (it hangs, it cannot be asked, the keyring is
// locked, the user refuses, a secret is too large) it says with a status of its own, unless the local store
// holds the item that is wanted.
//
// Creating an item holds a lock of the user, because the service itself replaces silently, or makes a
// second item: of two writers at once one succeeds, and the other learns of the duplicate.
class SearchListCredentialStore final : public platform::CredentialStore {
  public:
    // What is to be known of the service. Each is asked at every operation that wants it.
    struct Service {
        // Its store, borrowed; null where there is no bus to ask it on, or no module for it.
        std::function<platform::CredentialStore*()> store;
        // Where nobody could be asked: whether there is a service all the same.
        std::function<bool()> isSomewhere;
    };

    // Where new items go.
    enum class NewItems { ToTheService, ToTheLocalStore };

    //  local  borrowed
    //  lock   takes the lock of this user; asked when an item is created
    SearchListCredentialStore(Service service, platform::CredentialStore& local,
                              std::function<posix::FileLock()> lock,
                              NewItems newItems = NewItems::ToTheService)
        : _service(std::move(service)),
          _local(local),
          _lock(std::move(lock)),
          _newItems(newItems) {}

    // An item for the local store is refused where the service is known to hold it, locked or not.
    platform::CredentialOutcome createItem(const platform::CredentialItem& item,
                                           const std::string& data) override;
    platform::CredentialFinding findItem(const std::string& service, const std::string& account,
                                         platform::CredentialWish wish) override;
    std::int32_t deleteItem(const platform::CredentialItemReference& reference) override;

  private:
    template <class Question>
    auto _askService(const Question& question)
        -> decltype(question(std::declval<platform::CredentialStore&>()));
    bool _isWithoutService(std::int32_t status);

    const Service _service;
    platform::CredentialStore& _local;
    const std::function<posix::FileLock()> _lock;
    const NewItems _newItems;
    std::mutex _mutex;
    // Whether the service has ever answered: then it does not stop to exist.
    bool _hasServed = false;
};

} // namespace welcomer::desktop
