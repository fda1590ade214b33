// A credential store in memory.

#pragma once

#include "platform/CredentialStore.h"
#include "tests/fakes/CallRecorder.h"

#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::fakes {

// Recorded as "CredentialStore.createItem service, account" and so on. Any thread.
class FakeCredentialStore final : public platform::CredentialStore {
  public:
    enum class Operation {
        CreateTrustedApplication,
        CreateAccess,
        CreateItem,
        FindItem,
        ReadAttributes,
        DeleteItem
    };

    struct StoredItem {
        platform::CredentialItem item;
        std::string data;
    };

    explicit FakeCredentialStore(CallRecorder& recorder) : _recorder(recorder) {}

    std::int32_t createTrustedApplication(const std::string& path,
                                          platform::TrustedApplication& application) override;
    std::int32_t createAccess(const std::string& description,
                              std::vector<platform::TrustedApplication> trustedApplications,
                              platform::CredentialAccess& access) override;
    platform::CredentialOutcome createItem(const platform::CredentialItem& item,
                                           const std::string& data) override;
    platform::CredentialFinding findItem(const std::string& service, const std::string& account,
                                         platform::CredentialWish wish) override;
    std::int32_t deleteItem(const platform::CredentialItemReference& reference) override;

    // The items in the order of their creation.
    std::vector<StoredItem> items() const;

    // What a creation that fails has to say besides its status.
    std::string detail;

    // How often an item's data was asked for.
    int dataReads() const;

    // Puts an item in place of the one with the same service and account. Nothing is recorded, and no set
    // status applies.
    void put(const platform::CredentialItem& item, const std::string& data);

    // Has an operation give this status from now on and do nothing; kCredentialSuccess ends that.
    void setStatus(Operation operation, std::int32_t status);

  private:
    // All with _mutex held.
    std::int32_t statusOf(Operation operation) const;
    std::vector<StoredItem>::iterator find(const std::string& service, const std::string& account);

    CallRecorder& _recorder;
    mutable std::mutex _mutex;
    std::vector<StoredItem> _items;
    int _dataReads = 0;
    std::map<Operation, std::int32_t> _statuses;
};

} // namespace welcomer::fakes
