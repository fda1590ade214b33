// What every preference store does.

#include "backends/local/preferences/LocalPreferenceStore.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeFileSystem.h"
#include "tests/fakes/FakePreferenceStore.h"
#include "tests/fakes/FakeProcessIdentity.h"
#include "tests/fakes/FakeSystemLog.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <thread>
#include <vector>

namespace welcomer {
namespace {

const std::string kDomain = "com.corvid.FirstRun";
const std::string kOtherDomain = "com.corvid.screensaver";

// A store, and another process's view of the same preferences.
class Backend {
  public:
    virtual ~Backend() = default;
    virtual platform::PreferenceStore& store() = 0;
    virtual void storeElsewhere(const std::string& key, const std::optional<PropertyList>& value) = 0;
    virtual std::optional<PropertyList> readElsewhere(const std::string& key) = 0;
};

class FakeBackend final : public Backend {
  public:
    platform::PreferenceStore& store() override { return _store; }
    void storeElsewhere(const std::string& key, const std::optional<PropertyList>& value) override {
        _store.store(kDomain, key, value);
    }
    std::optional<PropertyList> readElsewhere(const std::string& key) override {
        const PropertyList::Dictionary stored = _store.stored(kDomain);
        return stored.contains(key) ? std::optional(stored.at(key)) : std::nullopt;
    }

  private:
    fakes::CallRecorder _recorder;
    fakes::FakePreferenceStore _store{_recorder};
};

class LocalBackend final : public Backend {
  public:
    LocalBackend() { _root.addDirectory("/home/user/Library"); }
    platform::PreferenceStore& store() override { return _store; }
    void storeElsewhere(const std::string& key, const std::optional<PropertyList>& value) override {
        local::LocalPreferenceStore other(posix::RootFolder(_root.path()), _identity, _log);
        if (value) {
            other.setValue(key, *value, kDomain);
        } else {
            other.removeValue(key, kDomain);
        }
        ASSERT_TRUE(other.synchronise(kDomain));
    }
    std::optional<PropertyList> readElsewhere(const std::string& key) override {
        return local::LocalPreferenceStore(posix::RootFolder(_root.path()), _identity, _log)
            .copyValue(key, kDomain);
    }

  private:
    TemporaryRoot _root;
    fakes::CallRecorder _recorder;
    fakes::FakeFileSystem _fileSystem{_recorder};
    fakes::FakeProcessIdentity _identity{_recorder, _fileSystem};
    fakes::FakeSystemLog _log{_recorder};
    local::LocalPreferenceStore _store{posix::RootFolder(_root.path()), _identity, _log};
};

template <class BackendType>
class PreferenceStoreContract : public testing::Test {
  protected:
    BackendType backend;
    platform::PreferenceStore& store = backend.store();
};

using Backends = testing::Types<FakeBackend, LocalBackend>;
TYPED_TEST_SUITE(PreferenceStoreContract, Backends);

TYPED_TEST(PreferenceStoreContract, AKeyThatIsNotThereHasNoValue) {
    EXPECT_EQ(this->store.copyValue("Key", kDomain), std::nullopt);
    EXPECT_TRUE(this->store.synchronise(kDomain));
    EXPECT_EQ(this->store.copyValue("Key", kDomain), std::nullopt);
}

TYPED_TEST(PreferenceStoreContract, AChangeIsSeenHereAtOnceAndByOthersOnceSynchronised) {
    this->store.setValue("Key", "text", kDomain);
    EXPECT_EQ(this->store.copyValue("Key", kDomain), PropertyList("text"));
    EXPECT_EQ(this->backend.readElsewhere("Key"), std::nullopt);
    EXPECT_TRUE(this->store.synchronise(kDomain));
    EXPECT_EQ(this->store.copyValue("Key", kDomain), PropertyList("text"));
    EXPECT_EQ(this->backend.readElsewhere("Key"), PropertyList("text"));
}

TYPED_TEST(PreferenceStoreContract, ARemovalIsSeenHereAtOnceAndByOthersOnceSynchronised) {
    this->backend.storeElsewhere("Key", "text");
    this->store.removeValue("Key", kDomain);
    EXPECT_EQ(this->store.copyValue("Key", kDomain), std::nullopt);
    EXPECT_EQ(this->backend.readElsewhere("Key"), PropertyList("text"));
    EXPECT_TRUE(this->store.synchronise(kDomain));
    EXPECT_EQ(this->store.copyValue("Key", kDomain), std::nullopt);
    EXPECT_EQ(this->backend.readElsewhere("Key"), std::nullopt);
}

TYPED_TEST(PreferenceStoreContract, TheLastChangeOfAKeyCounts) {
    this->store.setValue("Set", 1, kDomain);
    this->store.setValue("Set", 2, kDomain);
    this->store.setValue("Removed", 1, kDomain);
    this->store.removeValue("Removed", kDomain);
    this->store.removeValue("Again", kDomain);
    this->store.setValue("Again", 3, kDomain);
    EXPECT_TRUE(this->store.synchronise(kDomain));
    EXPECT_EQ(this->backend.readElsewhere("Set"), PropertyList(2));
    EXPECT_EQ(this->backend.readElsewhere("Removed"), std::nullopt);
    EXPECT_EQ(this->backend.readElsewhere("Again"), PropertyList(3));
}

TYPED_TEST(PreferenceStoreContract, WhatOthersStoreIsSeenWhenTheDomainIsFirstUsed) {
    this->backend.storeElsewhere("Key", "theirs");
    EXPECT_EQ(this->store.copyValue("Key", kDomain), PropertyList("theirs"));
}

TYPED_TEST(PreferenceStoreContract, WhatOthersStoreLaterIsSeenOnceSynchronised) {
    EXPECT_EQ(this->store.copyValue("Key", kDomain), std::nullopt);
    this->backend.storeElsewhere("Key", "theirs");
    EXPECT_EQ(this->store.copyValue("Key", kDomain), std::nullopt);
    EXPECT_TRUE(this->store.synchronise(kDomain));
    EXPECT_EQ(this->store.copyValue("Key", kDomain), PropertyList("theirs"));
    this->backend.storeElsewhere("Key", std::nullopt);
    EXPECT_TRUE(this->store.synchronise(kDomain));
    EXPECT_EQ(this->store.copyValue("Key", kDomain), std::nullopt);
}

TYPED_TEST(PreferenceStoreContract, OnlyTheKeysThatWereChangedHereAreStored) {
    this->backend.storeElsewhere("Theirs", "old");
    this->backend.storeElsewhere("Both", "old");
    EXPECT_EQ(this->store.copyValue("Theirs", kDomain), PropertyList("old"));
    this->store.setValue("Both", "ours", kDomain);
    this->backend.storeElsewhere("Theirs", "new");
    this->backend.storeElsewhere("Both", "new");
    EXPECT_TRUE(this->store.synchronise(kDomain));
    EXPECT_EQ(this->backend.readElsewhere("Theirs"), PropertyList("new"));
    EXPECT_EQ(this->backend.readElsewhere("Both"), PropertyList("ours"));
    EXPECT_EQ(this->store.copyValue("Theirs", kDomain), PropertyList("new"));

    // What was stored once is not stored again.
    this->backend.storeElsewhere("Both", "newer");
    EXPECT_TRUE(this->store.synchronise(kDomain));
    EXPECT_EQ(this->backend.readElsewhere("Both"), PropertyList("newer"));
}

TYPED_TEST(PreferenceStoreContract, DomainsAreApart) {
    this->store.setValue("Key", 1, kDomain);
    this->store.setValue("Key", 2, kOtherDomain);
    EXPECT_TRUE(this->store.synchronise(kOtherDomain));
    EXPECT_EQ(this->backend.readElsewhere("Key"), std::nullopt);
    EXPECT_TRUE(this->store.synchronise(kDomain));
    EXPECT_EQ(this->backend.readElsewhere("Key"), PropertyList(1));
    EXPECT_EQ(this->store.copyValue("Key", kOtherDomain), PropertyList(2));
}

TYPED_TEST(PreferenceStoreContract, ValuesKeepTheirTypes) {
    const PropertyList::Dictionary values = {
        {"boolean", true},
        {"integer", 1},
        {"real", 1.0},
        {"text", "1"},
        {"data", PropertyList::Data{std::string("\0\xff", 2)}},
        {"date", PropertyList::Date{86'400}},
        {"array", PropertyList::Array{false, 0, "", PropertyList::Dictionary()}},
        {"dictionary", PropertyList::Dictionary{{"inner", PropertyList::Dictionary{{"x", -1}}}}},
        {"a key of every <kind> & \u00fc", "line\nfeed"},
    };
    for (const auto& [key, value] : values) {
        this->store.setValue(key, value, kDomain);
    }
    EXPECT_TRUE(this->store.synchronise(kDomain));
    for (const auto& [key, value] : values) {
        EXPECT_EQ(this->backend.readElsewhere(key), value) << key;
        EXPECT_EQ(this->store.copyValue(key, kDomain), value) << key;
    }
}

TYPED_TEST(PreferenceStoreContract, AValueThatCannotBeWrittenIsRefusedAndTheOthersAreStored) {
    this->backend.storeElsewhere("Key", "old");
    this->store.setValue("Other", "first", kDomain);
    const std::vector<PropertyList> unwritable = {"a\x01", PropertyList::Date{1e15},
                                                  PropertyList::Array{PropertyList::Dictionary{{"\x02", 1}}}};
    for (const PropertyList& value : unwritable) {
        this->store.setValue("Key", value, kDomain);
        EXPECT_EQ(this->store.copyValue("Key", kDomain), PropertyList("old"));
        this->store.setValue("New", value, kDomain);
        EXPECT_EQ(this->store.copyValue("New", kDomain), std::nullopt);
    }
    this->store.setValue("\x03", 1, kDomain);
    EXPECT_EQ(this->store.copyValue("\x03", kDomain), std::nullopt);
    this->store.setValue("Last", 1, kDomain);
    EXPECT_TRUE(this->store.synchronise(kDomain));
    EXPECT_EQ(this->backend.readElsewhere("Key"), PropertyList("old"));
    EXPECT_EQ(this->backend.readElsewhere("New"), std::nullopt);
    EXPECT_EQ(this->backend.readElsewhere("Other"), PropertyList("first"));
    EXPECT_EQ(this->backend.readElsewhere("Last"), PropertyList(1));
    EXPECT_TRUE(this->store.damagedPreferences().empty());
}

TYPED_TEST(PreferenceStoreContract, SeveralValuesComeInTheOrderOfTheirKeys) {
    this->backend.storeElsewhere("B", "text");
    this->backend.storeElsewhere("A", true);
    this->backend.storeElsewhere("Not asked for", 1);
    const std::vector<std::string> keys = {"B", "Missing", "A"};
    using Values = std::vector<std::optional<PropertyList>>;
    EXPECT_EQ(this->store.copyValues(keys, kDomain), (Values{"text", std::nullopt, true}));
    EXPECT_EQ(this->store.copyValues(keys, kOtherDomain), Values(keys.size()));
    EXPECT_TRUE(this->store.copyValues({}, kDomain).empty());
}

TYPED_TEST(PreferenceStoreContract, ChangesAreSeenAtOnceAmongSeveralValuesToo) {
    for (const char* key : {"Kept", "Set", "Removed"}) {
        this->backend.storeElsewhere(key, "old");
    }
    this->store.setValue("Set", "new", kDomain);
    this->store.removeValue("Removed", kDomain);
    this->store.setValue("Added", 1, kDomain);
    const std::vector<std::string> keys = {"Added", "Kept", "Removed", "Set"};
    using Values = std::vector<std::optional<PropertyList>>;
    EXPECT_EQ(this->store.copyValues(keys, kDomain), (Values{1, "old", std::nullopt, "new"}));
}

TYPED_TEST(PreferenceStoreContract, NothingIsDamagedToBeginWith) {
    EXPECT_TRUE(this->store.synchronise(kDomain));
    EXPECT_TRUE(this->store.damagedPreferences().empty());
}

TYPED_TEST(PreferenceStoreContract, ManyThreadsMayUseOneStore) {
    constexpr int kThreads = 4;
    constexpr int kRounds = 50;
    std::vector<std::thread> threads;
    for (int thread = 0; thread < kThreads; ++thread) {
        threads.emplace_back([this, thread] {
            const std::string key = "thread " + std::to_string(thread);
            for (int round = 1; round <= kRounds; ++round) {
                this->store.setValue(key, round, kDomain);
                EXPECT_TRUE(this->store.synchronise(kDomain));
                EXPECT_EQ(this->store.copyValue(key, kDomain), PropertyList(round));
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    for (int thread = 0; thread < kThreads; ++thread) {
        EXPECT_EQ(this->backend.readElsewhere("thread " + std::to_string(thread)), PropertyList(kRounds));
    }
}

} // namespace
} // namespace welcomer
