// What only preferences in files can do: survive other processes, kills and damage.

#include "backends/local/preferences/LocalPreferenceStore.h"
#include "propertylist/PropertyListReader.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeFileSystem.h"
#include "tests/fakes/FakeProcessIdentity.h"
#include "tests/fakes/FakeSystemLog.h"
#include "tests/support/MountNamespace.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <functional>
#include <string>
#include <sys/mount.h>
#include <sys/ptrace.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

namespace welcomer {
namespace {

using Names = std::vector<std::string>;

const std::string kDomain = "com.corvid.FirstRun";
const std::string kFolder = "/home/user/Library/Preferences";
const std::string kFile = kFolder + "/com.corvid.FirstRun.plist";

class LocalPreferenceStoreTest : public testing::Test {
  protected:
    LocalPreferenceStoreTest() { root.addDirectory("/home/user/Library"); }

    // What another process reads.
    PropertyList::Dictionary stored() {
        const PropertyListReadResult result = readPropertyList(root.content(kFile).value_or("nothing"));
        EXPECT_TRUE(result) << result.error;
        return result && result.value->isDictionary() ? *result.value->dictionary()
                                                      : PropertyList::Dictionary();
    }

    mode_t mode(const std::string& path) {
        struct stat status = {};
        EXPECT_EQ(::stat(root.locate(path).c_str(), &status), 0);
        return status.st_mode & 07777;
    }

    // Stores one value as another process.
    bool storeElsewhere(const std::string& key, const PropertyList& value) {
        local::LocalPreferenceStore other(posix::RootFolder(root.path()), identity, log);
        other.setValue(key, value, kDomain);
        return other.synchronise(kDomain);
    }

    // Runs a block in a process of its own; its result is that process's exit status.
    pid_t start(const std::function<int()>& block) {
        const pid_t child = ::fork();
        if (child == 0) {
            ::_exit(block());
        }
        return child;
    }

    static int waitFor(pid_t child) {
        int status = 0;
        while (::waitpid(child, &status, 0) < 0 && errno == EINTR) {
        }
        return status;
    }

    TemporaryRoot root;
    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem{recorder};
    fakes::FakeProcessIdentity identity{recorder, fileSystem};
    fakes::FakeSystemLog log{recorder};
    local::LocalPreferenceStore store{posix::RootFolder(root.path()), identity, log};
};

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
        const pid_t child = start([&] {
            ::ptrace(PTRACE_TRACEME, 0, nullptr, nullptr);
            ::raise(SIGSTOP);
            return own.synchronise(kDomain) ? 0 : 1;
        });
        int status = waitFor(child);
        ASSERT_TRUE(WIFSTOPPED(status));
        // Each system call stops the child twice: before it and after it.
        for (int stop = 0; stop <= calls && WIFSTOPPED(status); ++stop) {
            ASSERT_EQ(::ptrace(PTRACE_SYSCALL, child, nullptr, nullptr), 0);
            status = waitFor(child);
        }
        finished = WIFEXITED(status);
        if (finished) {
            EXPECT_EQ(WEXITSTATUS(status), 0);
        } else {
            ASSERT_EQ(::kill(child, SIGKILL), 0);
            waitFor(child);
        }

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
