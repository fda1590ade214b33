// Preferences in files that are damaged or mount points.

#include "tests/support/MountNamespace.h"
#include "tests/unit/backends/local/preferences/LocalPreferenceStoreFixture.h"

#include <filesystem>
#include <string>
#include <sys/mount.h>
#include <vector>

namespace welcomer {
namespace {

// Damage

class DamagedPreferencesTest : public LocalPreferenceStoreTest,
                               public testing::WithParamInterface<const char*> {};

INSTANTIATE_TEST_SUITE_P(Contents, DamagedPreferencesTest,
                         testing::Values("<?xml version=\"1.0\"?><plist version=\"1.0\"><dict><key>Trunc",
                                         "<plist version=\"1.0\"><array/></plist>", "{ Key = 1; ", "bplist00",
                                         "\xff\xfe\x01 garbage"));

TEST_P(DamagedPreferencesTest, CountAsEmptyAndAreSetAsideWhenTheyAreRead) {
    root.addFile(kFile, GetParam());
    EXPECT_EQ(store.copyValue("Key", kDomain), std::nullopt);
    EXPECT_EQ(root.names(kFolder), (Names{"com.corvid.FirstRun.plist.damaged"}));
    EXPECT_EQ(root.content(kFile + ".damaged"), GetParam());
    ASSERT_EQ(store.damagedPreferences().size(), 1U);
    const platform::DamagedPreferences damage = store.damagedPreferences().front();
    EXPECT_EQ(damage.domain, kDomain);
    EXPECT_EQ(damage.setAsidePath, kFile + ".damaged");
    EXPECT_FALSE(damage.reason.empty());
    EXPECT_EQ(damage.reason.find('\n'), std::string::npos);
    EXPECT_EQ(log.lines(), std::vector<std::string>{"Preferences com.corvid.FirstRun are damaged (" +
                                                    damage.reason + ") and now at " + kFile + ".damaged"});
    EXPECT_TRUE(store.synchronise(kDomain));
    EXPECT_EQ(store.damagedPreferences().size(), 1U);
}

TEST_P(DamagedPreferencesTest, AreNeverOverwrittenButSetAsideWhenTheDomainIsWritten) {
    root.addFile(kFile, GetParam());
    store.setValue("Key", 1, kDomain);
    EXPECT_TRUE(store.synchronise(kDomain));
    EXPECT_EQ(root.content(kFile + ".damaged"), GetParam());
    EXPECT_EQ(stored(), (PropertyList::Dictionary{{"Key", 1}}));
    EXPECT_EQ(store.damagedPreferences().size(), 1U);
}

TEST_F(LocalPreferenceStoreTest, EachDamagedFileGetsANameOfItsOwn) {
    for (const char* content : {"first", "second", "third"}) {
        root.addFile(kFile, std::string("{ damaged, ") + content);
        EXPECT_TRUE(store.synchronise(kDomain));
    }
    EXPECT_EQ(root.names(kFolder),
              (Names{"com.corvid.FirstRun.plist.damaged", "com.corvid.FirstRun.plist.damaged-2",
                     "com.corvid.FirstRun.plist.damaged-3"}));
    EXPECT_EQ(root.content(kFile + ".damaged"), "{ damaged, first");
    EXPECT_EQ(root.content(kFile + ".damaged-2"), "{ damaged, second");
    EXPECT_EQ(root.content(kFile + ".damaged-3"), "{ damaged, third");
    EXPECT_EQ(store.damagedPreferences().size(), 3U);
}

TEST_F(LocalPreferenceStoreTest, ADamagedFileThatCannotBeSetAsideIsLeftAloneAndNothingIsStored) {
    root.addFile(kFile, "{ damaged");
    root.addFile(kFile + ".damaged", "");
    for (int number = 2; number <= 1000; ++number) {
        root.addFile(kFile + ".damaged-" + std::to_string(number), "");
    }
    store.setValue("Key", 1, kDomain);
    EXPECT_FALSE(store.synchronise(kDomain));
    EXPECT_FALSE(store.synchronise(kDomain));
    EXPECT_EQ(root.content(kFile), "{ damaged");
    ASSERT_EQ(store.damagedPreferences().size(), 1U);
    EXPECT_EQ(store.damagedPreferences().front().setAsidePath, "");
    std::filesystem::remove(root.locate(kFile + ".damaged"));
    EXPECT_TRUE(store.synchronise(kDomain));
    EXPECT_EQ(root.content(kFile + ".damaged"), "{ damaged");
}

// Mount points

class MountedPreferenceFileTest : public LocalPreferenceStoreTest {
  protected:
    void SetUp() override {
        if (!mayMount()) {
            GTEST_SKIP() << "needs the right to mount a file in a namespace of its own";
        }
        enterMountNamespace();
    }

    ~MountedPreferenceFileTest() override { unmount(root.locate(kFile)); }

    // Makes the domain's file a mount point.
    void mountFile(const std::string& content) {
        root.addFile("/elsewhere", content);
        root.addFile(kFile, "");
        ASSERT_EQ(
            ::mount(root.locate("/elsewhere").c_str(), root.locate(kFile).c_str(), nullptr, MS_BIND, nullptr),
            0);
    }
};

TEST_F(MountedPreferenceFileTest, IsRewrittenInPlace) {
    mountFile("{ Old = \"" + std::string(1000, 'x') + "\"; Kept = yes; }");
    store.removeValue("Old", kDomain);
    store.setValue("New", 1, kDomain);
    EXPECT_TRUE(store.synchronise(kDomain));
    EXPECT_EQ(stored(), (PropertyList::Dictionary{{"Kept", "yes"}, {"New", 1}}));
    EXPECT_EQ(root.content("/elsewhere"), root.content(kFile));
    EXPECT_EQ(root.names(kFolder), (Names{"com.corvid.FirstRun.plist"}));
}

TEST_F(MountedPreferenceFileTest, IsSetAsideByItsContentWhenItIsDamaged) {
    mountFile("{ damaged");
    store.setValue("New", 1, kDomain);
    EXPECT_TRUE(store.synchronise(kDomain));
    EXPECT_EQ(root.content(kFile + ".damaged"), "{ damaged");
    EXPECT_EQ(stored(), (PropertyList::Dictionary{{"New", 1}}));
    EXPECT_EQ(root.content("/elsewhere"), root.content(kFile));
    EXPECT_EQ(store.damagedPreferences().front().setAsidePath, kFile + ".damaged");
}

} // namespace
} // namespace welcomer
