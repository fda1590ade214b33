#include "backends/desktop/credentials/SearchListCredentialStore.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeCredentialStore.h"
#include "tests/support/FindCredential.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <functional>

namespace welcomer::desktop {

namespace {

using fakes::FakeCredentialStore;
using Operation = FakeCredentialStore::Operation;
using platform::CredentialItem;

class SearchListCredentialStoreTest : public testing::Test {
  protected:
    // The status of reading an item.
    std::int32_t read() { return findCredential(store, &data, &reference, &attributes); }

    // The status of looking an item up and deleting it.
    std::int32_t lookUpAndDelete() {
        std::unique_ptr<platform::CredentialItemReference> found;
        const std::int32_t status = findCredential(store, nullptr, &found);
        return status == platform::kCredentialSuccess ? store.deleteItem(*found) : status;
    }

    CredentialItem itemOf(std::int64_t changed) const {
        CredentialItem other = item;
        other.changed = changed;
        return other;
    }

    const CredentialItem item{"service", "account", "label", std::nullopt};
    TemporaryRoot root;
    fakes::CallRecorder recorder;
    FakeCredentialStore service{recorder};
    FakeCredentialStore local{recorder};
    bool serviceIsThere = true;
    bool serviceIsSomewhere = false;
    const SearchListCredentialStore::Service access{[this] { return serviceIsThere ? &service : nullptr; },
                                                    [this] {
                                                        return serviceIsSomewhere;
                                                    }};
    const std::function<posix::FileLock()> lock = [this] {
        return posix::FileLock(posix::RootFolder(root.path()), "/locks/search");
    };
    SearchListCredentialStore store{access, local, lock};
    SearchListCredentialStore storeForLocalItems{access, local, lock,
                                                 SearchListCredentialStore::NewItems::ToTheLocalStore};
    std::string data = "untouched";
    std::unique_ptr<platform::CredentialItemReference> reference;
    CredentialItem attributes;
};

// The statuses of a service that is not there, where it is nowhere else either.
class WithoutAService : public SearchListCredentialStoreTest,
                        public testing::WithParamInterface<std::int32_t> {
  protected:
    void SetUp() override {
        service.setStatus(Operation::FindItem, GetParam());
        service.setStatus(Operation::CreateItem, GetParam());
    }
};
INSTANTIATE_TEST_SUITE_P(Statuses, WithoutAService,
                         testing::Values(platform::kCredentialNoService, platform::kCredentialNoBus,
                                         platform::kCredentialBusDied));

// The statuses that say why the service does not do it.
class WithARefusal : public SearchListCredentialStoreTest, public testing::WithParamInterface<std::int32_t> {
  protected:
    void SetUp() override {
        service.setStatus(Operation::FindItem, GetParam());
        service.setStatus(Operation::CreateItem, GetParam());
    }
};
INSTANTIATE_TEST_SUITE_P(Statuses, WithARefusal,
                         testing::Values(platform::kCredentialLocked, platform::kCredentialDismissed,
                                         platform::kCredentialPromptUnanswered, platform::kCredentialTooLarge,
                                         platform::kCredentialServiceFailed,
                                         platform::kCredentialFindTimedOut,
                                         platform::kCredentialCreateTimedOut,
                                         platform::kCredentialStartFailed));

} // namespace

TEST_F(SearchListCredentialStoreTest, ItemsAreCreatedByTheService) {
    EXPECT_EQ(store.createItem(item, "secret"), 0);
    EXPECT_EQ(service.items().size(), 1U);
    EXPECT_TRUE(local.items().empty());
}

TEST_F(SearchListCredentialStoreTest, AnItemOfTheServiceIsNotCreatedAgain) {
    service.put(item, "first");
    EXPECT_EQ(store.createItem(item, "second"), platform::kCredentialDuplicateItem);
    EXPECT_EQ(service.items().front().data, "first");
    EXPECT_TRUE(local.items().empty());
}

TEST_F(SearchListCredentialStoreTest, AnItemOfTheLocalStoreIsNotCreatedAgain) {
    local.put(item, "first");
    EXPECT_EQ(store.createItem(item, "second"), platform::kCredentialDuplicateItem);
    EXPECT_TRUE(service.items().empty());
    EXPECT_EQ(local.items().front().data, "first");
}

TEST_F(SearchListCredentialStoreTest, WithoutALockFileNothingIsCreated) {
    root.addDirectory("/locks/search"); // in the file's place
    EXPECT_EQ(store.createItem(item, "secret"), platform::kCredentialWriteFailed);
    EXPECT_TRUE(service.items().empty());
    EXPECT_TRUE(local.items().empty());
}

TEST_F(SearchListCredentialStoreTest, ALockFileIsNeverASymbolicLink) {
    root.addDirectory("/locks");
    std::filesystem::create_symlink(root.locate("/elsewhere"), root.locate("/locks/search"));
    EXPECT_EQ(store.createItem(item, "secret"), platform::kCredentialWriteFailed);
    EXPECT_FALSE(std::filesystem::exists(root.locate("/elsewhere")));
}

TEST_F(SearchListCredentialStoreTest, TheServiceIsSearchedFirst) {
    service.put(item, "of the service");
    local.put(item, "of the local store");
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(data, "of the service");
}

TEST_F(SearchListCredentialStoreTest, WhatTheServiceHasNotIsSearchedInTheLocalStore) {
    local.put(item, "of the local store");
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(data, "of the local store");
    EXPECT_EQ(attributes.label, "label");
}

TEST_F(SearchListCredentialStoreTest, WhatNeitherHasIsNotFound) {
    EXPECT_EQ(read(), platform::kCredentialItemNotFound);
    EXPECT_EQ(data, "untouched");
    EXPECT_EQ(reference, nullptr);
}

TEST_F(SearchListCredentialStoreTest, DamageToTheLocalStoreIsSaidWhereTheServiceHasNothing) {
    local.setStatus(Operation::FindItem, platform::kCredentialStoreDamaged);
    EXPECT_EQ(read(), platform::kCredentialStoreDamaged);
}

TEST_F(SearchListCredentialStoreTest, OfTwoTheNewestIsReadWithItsAttributes) {
    struct {
        std::int64_t ofService;
        std::int64_t ofLocal;
        const char* read;
    } const cases[] = {{2, 1, "of the service"},
                       {1, 2, "of the local store"},
                       {1, 1, "of the service"},
                       {0, 1, "of the local store"}};
    for (const auto& [ofService, ofLocal, expected] : cases) {
        service.put(itemOf(ofService), "of the service");
        local.put(itemOf(ofLocal), "of the local store");
        EXPECT_EQ(read(), 0);
        EXPECT_EQ(data, expected);
        EXPECT_EQ(attributes.changed, std::max(ofService, ofLocal));
    }
}

TEST_F(SearchListCredentialStoreTest, DeletingDeletesInBoth) {
    for (const std::int64_t changed : {1, 3}) {
        service.put(itemOf(2), "of the service");
        local.put(itemOf(changed), "of the local store");
        EXPECT_EQ(read(), 0);
        EXPECT_EQ(lookUpAndDelete(), 0);
        EXPECT_TRUE(service.items().empty());
        EXPECT_TRUE(local.items().empty());
    }
}

TEST_F(SearchListCredentialStoreTest, WhereOneOfTwoCannotBeDeletedThatIsSaidAndTheOtherGoes) {
    for (const std::int64_t changed : {1, 3}) {
        service.put(itemOf(2), "of the service");
        local.put(itemOf(changed), "of the local store");
        service.setStatus(Operation::DeleteItem, platform::kCredentialDismissed);
        EXPECT_EQ(lookUpAndDelete(), platform::kCredentialDismissed);
        EXPECT_EQ(service.items().size(), 1U);
        EXPECT_TRUE(local.items().empty());
    }
}

TEST_F(SearchListCredentialStoreTest, WhatHasGoneFromOneMeanwhileIsAsGoodAsDeleted) {
    service.put(item, "of the service");
    local.put(item, "of the local store");
    service.setStatus(Operation::DeleteItem, platform::kCredentialItemNotFound);
    EXPECT_EQ(lookUpAndDelete(), 0);
    local.put(item, "of the local store");
    local.setStatus(Operation::DeleteItem, platform::kCredentialItemNotFound);
    EXPECT_EQ(lookUpAndDelete(), platform::kCredentialItemNotFound);
}

TEST_F(SearchListCredentialStoreTest,
       DeletingDeletesWhatReadingFoundInTheLocalStoreThoughTheServiceHasCaughtUp) {
    service.setStatus(Operation::FindItem, platform::kCredentialLocked);
    service.put(item, "of the service");
    local.put(item, "of the local store");
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(data, "of the local store");
    service.setStatus(Operation::FindItem, platform::kCredentialSuccess);

    EXPECT_EQ(store.deleteItem(*reference), 0);
    EXPECT_EQ(service.items().size(), 1U);
    EXPECT_TRUE(local.items().empty());
}

TEST_F(SearchListCredentialStoreTest, WhatIsGoneFromTheLocalStoreIsLookedUpAnew) {
    local.put(item, "of the local store");
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(lookUpAndDelete(), 0);
    service.put(item, "of the service");
    EXPECT_EQ(lookUpAndDelete(), 0);
    EXPECT_TRUE(service.items().empty());
}

TEST_F(SearchListCredentialStoreTest, WithoutAModuleTheLocalStoreServesAlone) {
    serviceIsThere = false;
    EXPECT_EQ(store.createItem(item, "secret"), 0);
    EXPECT_EQ(local.items().size(), 1U);
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(data, "secret");
    EXPECT_EQ(lookUpAndDelete(), 0);
    EXPECT_EQ(read(), platform::kCredentialItemNotFound);
}

TEST_P(WithoutAService, TheLocalStoreServesAlone) {
    EXPECT_EQ(read(), platform::kCredentialItemNotFound);
    EXPECT_EQ(store.createItem(item, "secret"), 0);
    EXPECT_EQ(local.items().size(), 1U);
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(data, "secret");
    EXPECT_EQ(lookUpAndDelete(), 0);
}

TEST_P(WithARefusal, ReadingSaysItUnlessTheLocalStoreHasTheItem) {
    EXPECT_EQ(read(), GetParam());
    local.put(item, "of the local store");
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(data, "of the local store");
}

TEST_P(WithARefusal, CreatingSaysItAndLeavesTheLocalStoreAlone) {
    EXPECT_EQ(store.createItem(item, "secret"), GetParam());
    EXPECT_TRUE(local.items().empty());
}

// Where nobody answers, and there is a service all the same.
TEST_F(SearchListCredentialStoreTest, AServiceThatIsSomewhereIsNotStoodInFor) {
    serviceIsSomewhere = true;
    serviceIsThere = false;
    EXPECT_EQ(read(), platform::kCredentialNoBus);
    EXPECT_EQ(store.createItem(item, "secret"), platform::kCredentialNoBus);
    EXPECT_TRUE(local.items().empty());
    local.put(item, "of the local store");
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(data, "of the local store");
}

TEST_F(SearchListCredentialStoreTest, AServiceThatHasAnsweredDoesNotCeaseToExist) {
    EXPECT_EQ(read(), platform::kCredentialItemNotFound);
    service.setStatus(Operation::FindItem, platform::kCredentialBusDied);
    service.setStatus(Operation::CreateItem, platform::kCredentialBusDied);
    EXPECT_EQ(read(), platform::kCredentialBusDied);
    EXPECT_EQ(store.createItem(item, "secret"), platform::kCredentialBusDied);
    EXPECT_TRUE(local.items().empty());
}

TEST_P(WithARefusal, AnItemForTheLocalStoreIsStoredAllTheSame) {
    EXPECT_EQ(storeForLocalItems.createItem(item, "secret"), 0);
    EXPECT_EQ(local.items().size(), 1U);
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(data, "secret");
}

TEST_F(SearchListCredentialStoreTest, AnItemForTheLocalStoreIsNoSecondOne) {
    service.put(item, "of the service");
    EXPECT_EQ(storeForLocalItems.createItem(item, "secret"), platform::kCredentialDuplicateItem);
    EXPECT_TRUE(local.items().empty());
}

TEST_F(SearchListCredentialStoreTest, AnItemForTheLocalStoreGoesThereThoughTheServiceIsThere) {
    EXPECT_EQ(storeForLocalItems.createItem(item, "secret"), 0);
    EXPECT_TRUE(service.items().empty());
    EXPECT_EQ(local.items().size(), 1U);
}

} // namespace welcomer::desktop
