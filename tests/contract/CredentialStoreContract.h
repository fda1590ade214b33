// What every credential store must do: a suite to be instantiated for each.

#pragma once

#include "platform/CredentialStore.h"
#include "tests/support/FindCredential.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <thread>
#include <vector>

namespace welcomer::contract {

using platform::CredentialAccess;
using platform::CredentialItem;
using platform::CredentialWish;
using platform::TrustedApplication;

// `Backend` is made for each test, with an empty `store`, whose items say that they lie in `storeName`.
template <typename Backend>
class CredentialStoreContract : public testing::Test {
  protected:
    // The secret of an item, or the status as text.
    std::string secret(const std::string& service, const std::string& account) {
        const platform::CredentialFinding found =
            this->credentials.store.findItem(service, account, CredentialWish::Secret);
        return found ? found.secret : platform::credentialStatusText(found.status);
    }

    // An item without its secret, which must be there.
    platform::CredentialFinding find(const std::string& service, const std::string& account) {
        platform::CredentialFinding found =
            this->credentials.store.findItem(service, account, CredentialWish::Item);
        EXPECT_EQ(found.status, platform::kCredentialSuccess);
        EXPECT_EQ(found.itemStatus, platform::kCredentialSuccess);
        EXPECT_EQ(found.secret, "");
        return found;
    }

    Backend credentials;
};

TYPED_TEST_SUITE_P(CredentialStoreContract);

inline const std::string kNotFound = platform::credentialStatusText(platform::kCredentialItemNotFound);

inline CredentialItem item(const std::string& service, const std::string& account,
                           const std::string& label = "") {
    return {service, account, label, std::nullopt};
}

TYPED_TEST_P(CredentialStoreContract, AnEmptyStoreHoldsNothing) {
    EXPECT_EQ(this->secret("service", "account"), kNotFound);
}

TYPED_TEST_P(CredentialStoreContract, AReferenceSaysWhereTheItemLiesAndWhoCanReadIt) {
    ASSERT_EQ(this->credentials.store.createItem(item("service", "account"), "secret"), 0);

    const auto reference = this->find("service", "account").reference;
    ASSERT_NE(reference, nullptr);
    EXPECT_EQ(reference->store().name, this->credentials.storeName);
    EXPECT_NE(reference->store().readers, "");
}

TYPED_TEST_P(CredentialStoreContract, AnItemIsFoundByServiceAndAccountTogether) {
    ASSERT_EQ(this->credentials.store.createItem(item("service", "account"), "secret"), 0);

    EXPECT_EQ(this->secret("service", "account"), "secret");
    EXPECT_EQ(this->secret("service", "other"), kNotFound);
    EXPECT_EQ(this->secret("other", "account"), kNotFound);
    EXPECT_EQ(this->secret("account", "service"), kNotFound);
}

TYPED_TEST_P(CredentialStoreContract, ASecretMayBeAnyBytesAndNone) {
    std::string bytes;
    for (int byte = 0; byte < 256; ++byte) {
        bytes += static_cast<char>(byte);
    }
    ASSERT_EQ(this->credentials.store.createItem(item("service", "bytes"), bytes), 0);
    ASSERT_EQ(this->credentials.store.createItem(item("service", "none"), ""), 0);

    EXPECT_EQ(this->secret("service", "bytes"), bytes);
    EXPECT_EQ(this->secret("service", "none"), "");
}

TYPED_TEST_P(CredentialStoreContract, AnExistingItemIsNotReplaced) {
    ASSERT_EQ(this->credentials.store.createItem(item("service", "account", "first"), "first"), 0);

    EXPECT_EQ(this->credentials.store.createItem(item("service", "account", "second"), "second"),
              platform::kCredentialDuplicateItem);
    EXPECT_EQ(this->secret("service", "account"), "first");
}

TYPED_TEST_P(CredentialStoreContract, AttributesComeBackAsTheyWereGiven) {
    CredentialItem stored = item("service", "account", "label \u00e9\u4e16");
    stored.access = CredentialAccess{"description", {{"/usr/bin/one"}, {"/usr/bin/two"}}};
    ASSERT_EQ(this->credentials.store.createItem(stored, "secret"), 0);

    const CredentialItem read = this->find("service", "account").item;

    EXPECT_EQ(read.service, "service");
    EXPECT_EQ(read.account, "account");
    EXPECT_EQ(read.label, "label \u00e9\u4e16");
    EXPECT_EQ(read.access, stored.access);
}

TYPED_TEST_P(CredentialStoreContract, AnItemWithoutAnAccessObjectHasTheStoresOwn) {
    ASSERT_EQ(this->credentials.store.createItem(item("service", "account"), "secret"), 0);

    const CredentialItem read = this->find("service", "account").item;
    EXPECT_EQ(read.access, std::nullopt);
}

TYPED_TEST_P(CredentialStoreContract, AttributesNeedNotBeText) {
    const std::string strange("\xff\x01\r\n<&>\0end", 11);
    CredentialItem stored = item(strange, strange + "account", strange + "label");
    stored.access = CredentialAccess{strange, {{"/" + strange}}};
    ASSERT_EQ(this->credentials.store.createItem(stored, "secret"), 0);

    const CredentialItem read = this->find(strange, strange + "account").item;
    EXPECT_EQ(read.label, strange + "label");
    EXPECT_EQ(read.access, stored.access);
}

TYPED_TEST_P(CredentialStoreContract, ADeletedItemIsGoneAndTheOthersStay) {
    ASSERT_EQ(this->credentials.store.createItem(item("service", "one"), "first"), 0);
    ASSERT_EQ(this->credentials.store.createItem(item("service", "two"), "second"), 0);

    EXPECT_EQ(this->credentials.store.deleteItem(*this->find("service", "one").reference), 0);
    EXPECT_EQ(this->secret("service", "one"), kNotFound);
    EXPECT_EQ(this->secret("service", "two"), "second");

    EXPECT_EQ(this->credentials.store.deleteItem(*this->find("service", "two").reference), 0);
    EXPECT_EQ(this->secret("service", "two"), kNotFound);
    EXPECT_EQ(this->credentials.store.createItem(item("service", "two"), "third"), 0);
    EXPECT_EQ(this->secret("service", "two"), "third");
}

TYPED_TEST_P(CredentialStoreContract, AReferenceToWhatIsGoneFindsNothing) {
    ASSERT_EQ(this->credentials.store.createItem(item("service", "account"), "secret"), 0);
    const auto reference = this->find("service", "account").reference;
    ASSERT_EQ(this->credentials.store.deleteItem(*this->find("service", "account").reference), 0);

    CredentialItem read{"untouched", "", "", {}};
    EXPECT_EQ(findCredential(this->credentials.store, nullptr, nullptr, &read),
              platform::kCredentialItemNotFound);
    EXPECT_EQ(read.service, "untouched");
    EXPECT_EQ(this->credentials.store.deleteItem(*reference), platform::kCredentialItemNotFound);
}

TYPED_TEST_P(CredentialStoreContract, AFindingHasWhatWasWantedOnSuccessOnly) {
    ASSERT_EQ(this->credentials.store.createItem(item("service", "account"), "secret"), 0);
    std::string data = "untouched";
    std::unique_ptr<platform::CredentialItemReference> reference;

    EXPECT_EQ(findCredential(this->credentials.store, &data, &reference, nullptr, "service", "other"),
              platform::kCredentialItemNotFound);
    EXPECT_EQ(data, "untouched");
    EXPECT_EQ(reference, nullptr);
    const auto present = this->credentials.store.findItem("service", "account", CredentialWish::Presence);
    EXPECT_TRUE(present);
    EXPECT_EQ(present.secret, "");
    EXPECT_EQ(findCredential(this->credentials.store, &data, &reference), 0);
    EXPECT_EQ(data, "secret");
    EXPECT_NE(reference, nullptr);
}

TYPED_TEST_P(CredentialStoreContract, ATrustedApplicationNeedsAnAbsolutePath) {
    TrustedApplication application{"untouched"};

    EXPECT_EQ(this->credentials.store.createTrustedApplication("", application),
              platform::kCredentialInvalidPath);
    EXPECT_EQ(this->credentials.store.createTrustedApplication("bin/agent", application),
              platform::kCredentialInvalidPath);
    EXPECT_EQ(application.path, "untouched");
    EXPECT_EQ(this->credentials.store.createTrustedApplication("/bin/agent", application), 0);
    EXPECT_EQ(application.path, "/bin/agent");
}

TYPED_TEST_P(CredentialStoreContract, AnAccessObjectHoldsItsDescriptionAndItsApplications) {
    CredentialAccess access;

    EXPECT_EQ(this->credentials.store.createAccess("description", {{"/bin/agent"}}, access), 0);
    EXPECT_EQ(access, (CredentialAccess{"description", {{"/bin/agent"}}}));
}

TYPED_TEST_P(CredentialStoreContract, OfThreadsThatCreateTheSameItemOneSucceeds) {
    constexpr int kThreads = 8;
    std::vector<std::int32_t> statuses(kThreads);
    std::vector<std::thread> threads;
    for (int index = 0; index < kThreads; ++index) {
        threads.emplace_back([&, index] {
            statuses[static_cast<std::size_t>(index)] =
                this->credentials.store.createItem(item("service", "account"), std::to_string(index)).status;
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }

    int winner = -1;
    for (int index = 0; index < kThreads; ++index) {
        if (statuses[static_cast<std::size_t>(index)] == platform::kCredentialSuccess) {
            EXPECT_EQ(winner, -1);
            winner = index;
        } else {
            EXPECT_EQ(statuses[static_cast<std::size_t>(index)], platform::kCredentialDuplicateItem);
        }
    }
    EXPECT_EQ(this->secret("service", "account"), std::to_string(winner));
}

REGISTER_TYPED_TEST_SUITE_P(CredentialStoreContract, AnEmptyStoreHoldsNothing,
                            AReferenceSaysWhereTheItemLiesAndWhoCanReadIt,
                            AnItemIsFoundByServiceAndAccountTogether, ASecretMayBeAnyBytesAndNone,
                            AnExistingItemIsNotReplaced, AttributesComeBackAsTheyWereGiven,
                            AnItemWithoutAnAccessObjectHasTheStoresOwn, AttributesNeedNotBeText,
                            ADeletedItemIsGoneAndTheOthersStay, AReferenceToWhatIsGoneFindsNothing,
                            AFindingHasWhatWasWantedOnSuccessOnly, ATrustedApplicationNeedsAnAbsolutePath,
                            AnAccessObjectHoldsItsDescriptionAndItsApplications,
                            OfThreadsThatCreateTheSameItemOneSucceeds);

} // namespace welcomer::contract
