// A reference to an item of a store that knows its items by their service and account alone.

#pragma once

#include "platform/CredentialStore.h"

#include <string>
#include <utility>

namespace welcomer::platform {

// Any thread.
class KeyedItemReference final : public CredentialItemReference {
  public:
    KeyedItemReference(CredentialStoreDescription store, std::string service, std::string account)
        : _store(std::move(store)),
          _service(std::move(service)),
          _account(std::move(account)) {}

    CredentialStoreDescription store() const override { return _store; }
    const std::string& service() const { return _service; }
    const std::string& account() const { return _account; }

  private:
    const CredentialStoreDescription _store;
    const std::string _service;
    const std::string _account;
};

} // namespace welcomer::platform
