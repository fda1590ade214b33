// What only preferences in files can do: their file, failures, and other processes.

#include "backends/local/preferences/LocalPreferenceStore.h"
#include "tests/fakes/FakeSystemLog.h"
#include "tests/support/KillAtSystemCall.h"
#include "tests/unit/backends/local/preferences/LocalPreferenceStoreFixture.h"

#include <csignal>
#include <filesystem>
#include <string>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <vector>

namespace welcomer {
namespace {

// The file

TEST_F(LocalPreferenceStoreTest, ADomainIsOneXMLFileOfTheUsersOwn) {
    const mode_t before = ::umask(0);
    store.setValue("Key", true, kDomain);
    EXPECT_TRUE(store.synchronise(kDomain));
    ::umask(before);
    EXPECT_EQ(root.names(kFolder), (Names{"com.corvid.FirstRun.plist"}));
    EXPECT_EQ(root.content(kFile).value_or("").substr(0, 5), "<?xml");
    EXPECT_EQ(stored(), (PropertyList::Dictionary{{"Key", true}}));
    EXPECT_EQ(mode(kFolder), 0700U);
    EXPECT_EQ(mode(kFile), 0600U);
}

TEST_F(LocalPreferenceStoreTest, AFileKeepsItsPermissions) {
    root.addFile(kFile, "{ Old = 1; }");
    ::chmod(root.locate(kFile).c_str(), 0640);
    store.setValue("Key", 1, kDomain);
    EXPECT_TRUE(store.synchronise(kDomain));
    EXPECT_EQ(mode(kFile), 0640U);
}

TEST_F(LocalPreferenceStoreTest, WithoutChangesNothingIsWritten) {
    EXPECT_TRUE(store.synchronise(kDomain));
    EXPECT_EQ(store.copyValue("Key", kDomain), std::nullopt);
    EXPECT_FALSE(std::filesystem::exists(root.locate(kFolder)));

    root.addFile(kFile, "{ Key = text; }");
    EXPECT_TRUE(store.synchronise(kDomain));
    store.setValue("Key", "text", kDomain); // as it is on disk
    EXPECT_TRUE(store.synchronise(kDomain));
    EXPECT_EQ(root.content(kFile), "{ Key = text; }");
}

TEST_F(LocalPreferenceStoreTest, AFileOfAnotherToolInTheBinaryFormatIsRead) {
    // { Flag = true; Name = "x"; }
    const std::string binary("bplist00\xd2\x01\x02\x03\x04\x54"
                             "Flag\x54"
                             "Name\x09\x51x\x08\x0d\x12\x17\x18\0\0\0\0\0\0\x01\x01\0\0\0\0\0\0\0\x05"
                             "\0\0\0\0\0\0\0\0\0\0\0\0\0\0\0\x1a",
                             63);
    root.addFile(kFile, binary);
    EXPECT_EQ(store.copyValue("Flag", kDomain), PropertyList(true));
    EXPECT_EQ(store.copyValue("Name", kDomain), PropertyList("x"));
    store.setValue("New", 1, kDomain);
    EXPECT_TRUE(store.synchronise(kDomain));
    EXPECT_EQ(stored(), (PropertyList::Dictionary{{"Flag", true}, {"Name", "x"}, {"New", 1}}));
    EXPECT_TRUE(store.damagedPreferences().empty());
}

TEST_F(LocalPreferenceStoreTest, AnEmptyFileIsAnEmptyDomain) {
    root.addFile(kFile, "");
    EXPECT_TRUE(store.synchronise(kDomain));
    store.setValue("Key", 1, kDomain);
    EXPECT_TRUE(store.synchronise(kDomain));
    EXPECT_EQ(root.names(kFolder), (Names{"com.corvid.FirstRun.plist"}));
    EXPECT_TRUE(store.damagedPreferences().empty());
}

TEST_F(LocalPreferenceStoreTest, ANameThatIsNoDomainsIsAlwaysEmptyAndNeverSynchronises) {
    for (const std::string& name :
         {std::string(), std::string("../escaped"), std::string("a/b"), std::string("nul\0", 4)}) {
        EXPECT_FALSE(store.synchronise(name));
        store.setValue("Key", 1, name);
        EXPECT_FALSE(store.synchronise(name));
        EXPECT_EQ(
            local::LocalPreferenceStore(posix::RootFolder(root.path()), identity, log).copyValue("Key", name),
            std::nullopt);
    }
    EXPECT_EQ(root.names("/home/user/Library"), Names());
}

// Failures

TEST_F(LocalPreferenceStoreTest, WithoutALibraryNothingIsStoredAndTheChangesAreKept) {
    std::filesystem::remove_all(root.locate("/home"));
    store.setValue("Key", 1, kDomain);
    EXPECT_FALSE(store.synchronise(kDomain));
    EXPECT_EQ(store.copyValue("Key", kDomain), PropertyList(1));
    root.addDirectory("/home/user/Library");
    EXPECT_TRUE(store.synchronise(kDomain));
    EXPECT_EQ(stored(), (PropertyList::Dictionary{{"Key", 1}}));
}

TEST_F(LocalPreferenceStoreTest, AWriteThatFailsLeavesTheOldFileAndKeepsTheChanges) {
    ASSERT_TRUE(storeElsewhere("Old", 1));
    store.setValue("New", std::string(100'000, 'x'), kDomain);
    ASSERT_NE(::signal(SIGXFSZ, SIG_IGN), SIG_ERR);
    rlimit before = {};
    ASSERT_EQ(::getrlimit(RLIMIT_FSIZE, &before), 0);
    const rlimit small = {50'000, before.rlim_max};
    ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &small), 0);
    EXPECT_FALSE(store.synchronise(kDomain));
    ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &before), 0);
    EXPECT_EQ(stored(), (PropertyList::Dictionary{{"Old", 1}}));
    EXPECT_EQ(root.names(kFolder), (Names{"com.corvid.FirstRun.plist"}));
    EXPECT_TRUE(store.synchronise(kDomain));
    EXPECT_EQ(stored().size(), 2U);
}

TEST_F(LocalPreferenceStoreTest, AValueThatCannotBeWrittenIsRefusedInTheLogWithItsKey) {
    store.setValue("New", PropertyList::Array{"\x01"}, kDomain);
    store.setValue("When", PropertyList::Date{1e15}, kDomain);
    EXPECT_EQ(
        log.records(),
        (std::vector<fakes::FakeSystemLog::Record>{
            {115, "Preferences com.corvid.FirstRun refuse a value that cannot be written: New/0 holds "
                  "U+0001, for which XML has no place"},
            {115, "Preferences com.corvid.FirstRun refuse a value that cannot be written: When is a date "
                  "outside the years 0000 to 9999"}}));
}

// { Bad = "a\x01"; Name = "x"; When = a date at 1e15; }, which no XML property list can hold.
std::string unwritableFile() {
    return {"bplist00\xd3\x01\x02\x03\x04\x05\x06\x53"
            "Bad\x54"
            "Name\x54"
            "When\x52"
            "a\x01\x51x\x33\x43\x0c\x6b\xf5\x26\x34\0\0\x08\x0f\x13\x18\x1d\x20\x22\0\0\0\0\0\0\x01\x01"
            "\0\0\0\0\0\0\0\x07\0\0\0\0\0\0\0\0\0\0\0\0\0\0\0\x2b",
            82};
}

TEST_F(LocalPreferenceStoreTest, AFileThatHoldsWhatCannotBeWrittenIsReadInFull) {
    root.addFile(kFile, unwritableFile());
    EXPECT_EQ(store.copyValue("Bad", kDomain), PropertyList("a\x01"));
    EXPECT_EQ(store.copyValue("Name", kDomain), PropertyList("x"));
    ASSERT_TRUE(store.copyValue("When", kDomain));
    EXPECT_GT(store.copyValue("When", kDomain)->date()->secondsSince1970, 9e14);
    EXPECT_TRUE(store.synchronise(kDomain)); // there is nothing to store
    EXPECT_EQ(log.lines(), std::vector<std::string>());
}

TEST_F(LocalPreferenceStoreTest, AFileThatHoldsWhatCannotBeWrittenIsLeftAsItIsWithOneLine) {
    root.addFile(kFile, unwritableFile());
    store.setValue("Name", "y", kDomain);
    EXPECT_FALSE(store.synchronise(kDomain));
    EXPECT_FALSE(store.synchronise(kDomain));
    EXPECT_EQ(root.content(kFile), unwritableFile());
    EXPECT_EQ(root.names(kFolder), (Names{"com.corvid.FirstRun.plist"}));
    EXPECT_EQ(store.copyValue("Name", kDomain), PropertyList("y")); // the change is kept
    EXPECT_EQ(log.lines(), std::vector<std::string>{
                               "Preferences com.corvid.FirstRun are damaged (nothing can be stored while "
                               "Bad holds U+0001, for which XML has no place) and still in their place"});
    ASSERT_EQ(store.damagedPreferences().size(), 1U);
    EXPECT_EQ(store.damagedPreferences().front().setAsidePath, "");
}

TEST_F(LocalPreferenceStoreTest, OnceWhatCannotBeWrittenIsReplacedOrRemovedEverythingIsStored) {
    root.addFile(kFile, unwritableFile());
    store.setValue("Name", "y", kDomain);
    store.setValue("Bad", "good", kDomain);
    EXPECT_FALSE(store.synchronise(kDomain));
    store.removeValue("When", kDomain);
    EXPECT_TRUE(store.synchronise(kDomain));
    EXPECT_EQ(stored(), (PropertyList::Dictionary{{"Bad", "good"}, {"Name", "y"}}));
}

TEST_F(LocalPreferenceStoreTest, WhatIsNoFileIsUnreadableAndLeftAlone) {
    root.addDirectory(kFile);
    EXPECT_FALSE(store.synchronise(kDomain));
    EXPECT_EQ(store.copyValue("Key", kDomain), std::nullopt);
    store.setValue("Key", 1, kDomain);
    EXPECT_FALSE(store.synchronise(kDomain));
    EXPECT_TRUE(std::filesystem::is_directory(root.locate(kFile)));

    std::filesystem::remove(root.locate(kFile));
    ASSERT_EQ(::mkfifo(root.locate(kFile).c_str(), 0600), 0);
    EXPECT_FALSE(store.synchronise(kDomain)); // and does not block
    EXPECT_TRUE(std::filesystem::is_fifo(root.locate(kFile)));
}

TEST_F(LocalPreferenceStoreTest, AFileOfAGigabyteIsUnreadableAndLeftAlone) {
    root.addFile(kFile, "{ Key = 1; }");
    std::filesystem::resize_file(root.locate(kFile), std::uintmax_t{1} << 30);
    EXPECT_EQ(store.copyValue("Key", kDomain), std::nullopt);
    store.setValue("Key", 1, kDomain);
    EXPECT_FALSE(store.synchronise(kDomain));
    EXPECT_EQ(std::filesystem::file_size(root.locate(kFile)), std::uintmax_t{1} << 30);
}

// Other processes

TEST_F(LocalPreferenceStoreTest, ProcessesThatSetDifferentKeysThousandsOfTimesLoseNone) {
    constexpr int kProcesses = 4;
    constexpr int kRounds = 1000;
    constexpr int kKeys = 8;
    const auto keyOf = [](int process, int round) {
        return "process " + std::to_string(process) + " key " + std::to_string(round % kKeys);
    };
    std::vector<pid_t> children;
    for (int process = 0; process < kProcesses; ++process) {
        children.push_back(start([&, process] {
            local::LocalPreferenceStore own(posix::RootFolder(root.path()), identity, log);
            for (int round = 0; round < kRounds; ++round) {
                own.setValue(keyOf(process, round), round, kDomain);
                if (!own.synchronise(kDomain)) {
                    return 1;
                }
                // The keys of the rounds before must still be there.
                for (int before = std::max(0, round - kKeys + 1); before <= round; ++before) {
                    if (own.copyValue(keyOf(process, before), kDomain) != PropertyList(before)) {
                        return 2;
                    }
                }
            }
            return 0;
        }));
    }
    for (const pid_t child : children) {
        EXPECT_EQ(waitFor(child), 0);
    }
    PropertyList::Dictionary expected;
    for (int process = 0; process < kProcesses; ++process) {
        for (int round = kRounds - kKeys; round < kRounds; ++round) {
            expected[keyOf(process, round)] = round;
        }
    }
    EXPECT_EQ(stored(), expected);
    EXPECT_EQ(root.names(kFolder), (Names{"com.corvid.FirstRun.plist"}));
}

TEST_F(LocalPreferenceStoreTest, KilledAtAnySystemCallOfSynchronisingItLeavesTheFileWholeOldOrNew) {
    const std::string filling(20'000, 'x'); // longer than one block
    const auto generation = [&](int number) {
        return PropertyList::Dictionary{{"First", number}, {"Filling", filling}, {"Last", number}};
    };
    ASSERT_TRUE(storeElsewhere("Filling", filling));
    ASSERT_TRUE(storeElsewhere("First", 0));
    ASSERT_TRUE(storeElsewhere("Last", 0));

    bool finished = false;
    bool sawOld = false;
    bool sawNew = false;
    int calls = 0;
    for (int current = 0; !finished; ++calls) {
        ASSERT_LT(calls, 1000);
        local::LocalPreferenceStore own(posix::RootFolder(root.path()), identity, log);
        own.setValue("First", current + 1, kDomain);
        own.setValue("Last", current + 1, kDomain);
        const std::optional<int> ended =
            killAtSystemCall([&] { return own.synchronise(kDomain) ? 0 : 1; }, calls + 1);
        finished = ended.has_value();
        EXPECT_EQ(ended.value_or(0), 0);

        const PropertyList::Dictionary after = stored();
        const bool isNew = after == generation(current + 1);
        ASSERT_TRUE(isNew || after == generation(current)) << "killed at stop " << calls;
        sawOld = sawOld || !isNew;
        sawNew = sawNew || (isNew && !finished);
        current += isNew ? 1 : 0;
        ASSERT_TRUE(storeElsewhere("Last", current)); // the next one is not held up by what was left
    }
    EXPECT_TRUE(sawOld);
    EXPECT_TRUE(sawNew);
    EXPECT_GT(calls, 10);
    ASSERT_TRUE(storeElsewhere("First", -1));
    EXPECT_EQ(root.names(kFolder), (Names{"com.corvid.FirstRun.plist"}));
}

} // namespace
} // namespace welcomer
