#include "backends/desktop/SearchListCredentialStore.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeCredentialStore.h"

#include <gtest/gtest.h>

#include <filesystem>

namespace welcomer::desktop {

namespace {

using fakes::FakeCredentialStore;
using Operation = FakeCredentialStore::Operation;
using platform::CredentialItem;

class SearchListCredentialStoreTest : public testing::Test {
  protected:
    // The status of reading an item.
    std::int32_t read() { return store.findItem("service", "account", &data, &reference); }

    // The status of looking an item up and deleting it, as the agent does.
    std::int32_t lookUpAndDelete() {
        std::unique_ptr<platform::CredentialItemReference> found;
        const std::int32_t status = store.findItem("service", "account", nullptr, &found);
        return status == platform::kCredentialSuccess ? store.deleteItem(*found) : status;
    }

    const CredentialItem item{"service", "account", "label", std::nullopt};
    TemporaryRoot root;
    fakes::CallRecorder recorder;
    FakeCredentialStore service{recorder};
    FakeCredentialStore local{recorder};
    bool serviceIsThere = true;
    SearchListCredentialStore store{[this] { return serviceIsThere ? &service : nullptr; }, local,
                                    [this] {
                                        return local::FileLock(local::RootFolder(root.path()),
                                                               "/locks/search");
                                    }};
    std::string data = "untouched";
    std::unique_ptr<platform::CredentialItemReference> reference;
};

// The statuses that say that there is no service.
class WithoutAService : public SearchListCredentialStoreTest,
                        public testing::WithParamInterface<std::int32_t> {
  protected:
    void SetUp() override {
        service.setStatus(Operation::FindItem, GetParam());
        service.setStatus(Operation::CreateItem, GetParam());
    }
};
INSTANTIATE_TEST_SUITE_P(Statuses, WithoutAService,
                         testing::Values(platform::kCredentialNoService, platform::kCredentialNoBus));

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
                                         platform::kCredentialServiceFailed));

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
    CredentialItem attributes;
    EXPECT_EQ(store.readAttributes(*reference, attributes), 0);
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

TEST_F(SearchListCredentialStoreTest, DeletingDeletesWhatReadingFoundInTheService) {
    service.put(item, "of the service");
    local.put(item, "of the local store");
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(lookUpAndDelete(), 0);
    EXPECT_TRUE(service.items().empty());
    EXPECT_EQ(local.items().size(), 1U);
}

TEST_F(SearchListCredentialStoreTest,
       DeletingDeletesWhatReadingFoundInTheLocalStoreThoughTheServiceHasCaughtUp) {
    service.setStatus(Operation::FindItem, platform::kCredentialLocked);
    service.put(item, "of the service");
    local.put(item, "of the local store");
    EXPECT_EQ(read(), 0);
    EXPECT_EQ(data, "of the local store");
    service.setStatus(Operation::FindItem, platform::kCredentialSuccess);

    EXPECT_EQ(lookUpAndDelete(), 0);
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

} // namespace welcomer::desktop
