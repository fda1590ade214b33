// The hand-off and the agent on the local backend, below a temporary root or in a mount namespace.

#include "agent/wlnimbussetup.h"
#include "backends/Backends.h"
#include "backends/simulated/VirtualTime.h"
#include "handoff/LaunchAgentFile.h"
#include "handoff/ReplayItem.h"
#include "handoff/WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup.h"
#include "tests/fakes/CallRecorder.h"
#include "tests/fakes/FakeSystemLog.h"
#include "tests/support/FindCredential.h"
#include "tests/support/MountNamespace.h"

#include <array>
#include <chrono>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <iterator>
#include <map>
#include <optional>
#include <spawn.h>
#include <string>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace welcomer {
namespace {

namespace fs = std::filesystem;
using namespace std::chrono_literals;
using Lines = std::vector<std::string>;

const std::string kFileName = std::string(kLaunchAgentLabel) + ".plist";

std::string fileContent(const fs::path& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

// Every file and folder below a folder, with its size.
std::map<std::string, std::uintmax_t> filesBelow(const fs::path& folder) {
    std::map<std::string, std::uintmax_t> files;
    if (fs::exists(folder)) {
        for (const auto& entry : fs::recursive_directory_iterator(folder)) {
            if (entry.is_regular_file()) {
                files[fs::relative(entry.path(), folder)] = entry.file_size();
            }
        }
    }
    return files;
}

bool startsWith(const std::string& text, const std::string& beginning) {
    return text.compare(0, beginning.size(), beginning) == 0;
}

int statusOf(pid_t child) {
    int status = 0;
    waitpid(child, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
}

class AgentOnDiskTest : public testing::Test {
  protected:
    AgentOnDiskTest() {
        std::string pattern = (fs::temp_directory_path() / "welcomer-agent-XXXXXX").string();
        root = mkdtemp(pattern.data());
        fs::create_directories(root.string() + "/Setup.app");
        fs::copy(fs::path(WELCOMER_SETUP_BUNDLE) / "Resources", root / "Setup.app/Resources",
                 fs::copy_options::recursive);
        owner = buildPlatform({.root = root.string(), .systemLog = &log});
        installed.emplace(owner->platform());
        home = root.string() + owner->platform().processIdentity.homeDirectory();
        agents = home / "Library/LaunchAgents";
    }

    ~AgentOnDiskTest() override {
        if (!mounted.empty()) {
            unmount(mounted);
        }
        fs::remove_all(root);
    }

    // Has a folder be a small disk of its own, which only this process sees.
    void mountOn(const fs::path& folder, const std::string& size) {
        enterMountNamespace();
        fs::create_directories(folder);
        mountMemory(folder, size);
        mounted = folder;
    }

    void makeHome() { fs::create_directories(home); }

    bool store(const PropertyList& object = PropertyList::Dictionary{
                   {"vlAliases", PropertyList::Array{"a"}}}) {
        const auto bundle = owner->platform().resourceBundles.open("/Setup.app");
        return WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup("anna", object, *bundle);
    }

    // The agent on this root with simulated time, so that the linger takes none.
    int runAgent() {
        simulated::VirtualTime time;
        const auto simulated = buildPlatform({.root = root.string(),
                                              .systemLog = &log,
                                              .clock = &time,
                                              .runLoops = &time,
                                              .dispatchQueues = &time});
        const platform::ScopedPlatform scope(simulated->platform());
        const std::array<const char*, 2> arguments{"wlnimbussetup", nullptr};
        return wlnimbussetup(1, arguments.data());
    }

    fs::path root;
    fs::path home;
    fs::path agents;
    std::string mounted;
    fakes::CallRecorder recorder;
    fakes::FakeSystemLog log{recorder};
    std::unique_ptr<PlatformOwner> owner;
    std::optional<platform::ScopedPlatform> installed;
};

// Fills a disk to its last byte.
void fill(const fs::path& folder) {
    const int file = open((folder / "filler").c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
    const std::string block(4096, 'x');
    while (write(file, block.data(), block.size()) > 0) {
    }
    close(file);
}

// Runs a program and gives its exit status.
int runProgram(const char* program, const std::vector<std::string>& arguments) {
    std::vector<char*> pointers{const_cast<char*>(program)};
    for (const std::string& argument : arguments) {
        pointers.push_back(const_cast<char*>(argument.c_str()));
    }
    pointers.push_back(nullptr);
    pid_t child = 0;
    EXPECT_EQ(posix_spawn(&child, program, nullptr, nullptr, pointers.data(), environ), 0);
    return statusOf(child);
}

TEST_F(AgentOnDiskTest, AHomeWithoutALibraryFolderWorks) {
    makeHome();
    EXPECT_TRUE(store());
    EXPECT_EQ(log.lines().size(), 1U);
    EXPECT_EQ(fs::status(home / "Library").permissions(), fs::perms(0700));
    EXPECT_EQ(fs::status(agents).permissions(), fs::perms(0755));
    EXPECT_EQ(fileContent(agents / kFileName),
              fileContent(fs::path(WELCOMER_SETUP_BUNDLE) / "Resources" / kFileName));
}

TEST_F(AgentOnDiskTest, TheAgentConsumesWhatTheWriterLeft) {
    makeHome();
    ASSERT_TRUE(store());
    log.clear();
    EXPECT_EQ(runAgent(), 0);
    const Lines lines = log.lines();
    ASSERT_EQ(lines.size(), 19U);
    EXPECT_EQ(Lines(lines.begin(), lines.begin() + 3),
              (Lines{"Self destructing...", "Killing onlineaccounts",
                     "Enabling post-login services for account anna"}));
    EXPECT_EQ(Lines(lines.begin() + 13, lines.end()),
              (Lines{"Vidlink: 1 aliases", "Chatter: 0 aliases", "delaying exit by two minutes",
                     "Enabling Nimbus service 'com.corvid.nimbus.service.calendars'",
                     "Enabling Nimbus service 'com.corvid.nimbus.service.reminders'", "exiting"}));
    platform::AccountService& accounts = owner->platform().accountService;
    const auto account = accounts.sharedManager().accountForID("anna", false);
    ASSERT_NE(account, nullptr);
    EXPECT_TRUE(accounts.isServiceEnabled(account.get(), platform::kSKServiceIDContacts));
    EXPECT_TRUE(accounts.isServiceEnabled(account.get(), platform::kSKServiceIDCalendars));
    EXPECT_FALSE(accounts.isServiceEnabled(account.get(), platform::kSKServiceIDLOC));
    EXPECT_FALSE(fs::exists(agents / kFileName));
    EXPECT_FALSE(WLGetNimbusReplayKeychainItem(nullptr, nullptr));
}

TEST_F(AgentOnDiskTest, TheTrustedApplicationIsTheBundlesAgent) {
    makeHome();
    ASSERT_TRUE(store());
    platform::CredentialStore& credentials = owner->platform().credentialStore;
    platform::CredentialItem item;
    ASSERT_EQ(findCredential(credentials, nullptr, nullptr, &item, kReplayItemService, kReplayItemAccount),
              0);
    EXPECT_EQ(item.label, "anna");
    EXPECT_EQ(item.access, (platform::CredentialAccess{"Welcomer Nimbus Access",
                                                       {{"/Setup.app/Resources/wlnimbussetup"}}}));
}

TEST_F(AgentOnDiskTest, SixtyFourMebibytesOfReplayDataAreRead) {
    makeHome();
    const PropertyList object(PropertyList::Dictionary{{"large", std::string(64U << 20, 'r')}});
    ASSERT_TRUE(store(object));
    PropertyList read;
    std::string account;
    ASSERT_TRUE(WLGetNimbusReplayKeychainItem(&read, &account));
    EXPECT_TRUE(read == object);
    EXPECT_EQ(account, "anna");
}

TEST_F(AgentOnDiskTest, AnItemThatCannotBeReadIsStillThereAfterwards) {
    makeHome();
    platform::CredentialStore& credentials = owner->platform().credentialStore;
    const platform::CredentialItem item{kReplayItemService, kReplayItemAccount, "anna", std::nullopt};
    ASSERT_EQ(credentials.createItem(item, std::string("\xFF\x00garbage", 9)), 0);
    EXPECT_EQ(runAgent(), 0);
    EXPECT_EQ(log.lines().back(), "exiting");
    std::string data;
    EXPECT_EQ(findCredential(credentials, &data, nullptr, nullptr, kReplayItemService, kReplayItemAccount),
              0);
    EXPECT_EQ(data, std::string("\xFF\x00garbage", 9));
}

TEST_F(AgentOnDiskTest, AFullDiskFailsTheItemAndLeavesNoPartialFile) {
    mountOn(home, "256k");
    fill(home);
    EXPECT_FALSE(store());
    EXPECT_EQ(log.lines(), (Lines{"Failed to create replay keychain item: 6"}));
    for (const auto& [name, size] : filesBelow(home)) {
        EXPECT_TRUE(name == "filler" || size == 0) << name;
    }
    log.clear();
    EXPECT_EQ(runAgent(), 0);
    EXPECT_EQ(log.lines().back(), "exiting");
}

TEST_F(AgentOnDiskTest, AFullDiskFailsTheLaunchAgentLeavesNoPartialFileAndKeepsTheItem) {
    mountOn(agents, "64k");
    fill(agents);
    EXPECT_FALSE(store());
    const Lines lines = log.lines();
    ASSERT_EQ(lines.size(), 2U);
    EXPECT_TRUE(startsWith(lines[1], "failed to install com.corvid.welcomer.nimbussetup: ")) << lines[1];
    EXPECT_EQ(filesBelow(agents).size(), 1U) << "only the filler";
    EXPECT_TRUE(WLGetNimbusReplayKeychainItem(nullptr, nullptr));
}

TEST_F(AgentOnDiskTest, AReadOnlyHomeIsLoggedByWriterAndAgent) {
    mountOn(home, "1m");
    makeReadOnly(home);
    EXPECT_FALSE(store());
    EXPECT_EQ(log.lines(), (Lines{"Failed to create replay keychain item: 6"}));
    log.clear();
    EXPECT_EQ(runAgent(), 0);
    const Lines lines = log.lines();
    ASSERT_EQ(lines.size(), 4U);
    EXPECT_TRUE(startsWith(lines[1], "Failed to remove wlnimbussetup plist for ")) << lines[1];
    EXPECT_EQ(lines[2], "Failed to find replay keychain item: 2");
    EXPECT_EQ(lines[3], "exiting");
    EXPECT_EQ(filesBelow(home).size(), 0U);
}

TEST_F(AgentOnDiskTest, AnItemInAHomeThatBecameReadOnlyIsUsedAllTheSame) {
    mountOn(home, "1m");
    ASSERT_TRUE(store());
    makeReadOnly(home);
    log.clear();
    EXPECT_EQ(runAgent(), 0);
    const Lines lines = log.lines();
    ASSERT_EQ(lines.size(), 11U);
    EXPECT_TRUE(startsWith(lines[1], "Failed to remove wlnimbussetup plist for ")) << lines[1];
    EXPECT_EQ(lines[2], "Failed to delete replay keychain item: 6");
    EXPECT_TRUE(startsWith(lines[5], "The accounts could not be stored: ")) << lines[5];
    EXPECT_EQ(lines[6], "Failed to retrieve SK_Account"); // a new account cannot be stored
    EXPECT_EQ(lines[7], "Vidlink: 1 aliases");
    EXPECT_EQ(lines[10], "exiting");
}

TEST_F(AgentOnDiskTest, AHomeThatDoesNotExistIsLoggedAndNotMade) {
    ASSERT_FALSE(fs::exists(home));
    EXPECT_FALSE(store());
    const Lines stored = log.lines();
    ASSERT_EQ(stored.size(), 1U);
    EXPECT_TRUE(startsWith(stored[0], "Failed to create replay keychain item: ")) << stored[0];
    EXPECT_FALSE(fs::exists(home));
    log.clear();
    EXPECT_EQ(runAgent(), 0);
    const Lines lines = log.lines();
    ASSERT_EQ(lines.size(), 4U);
    EXPECT_TRUE(startsWith(lines[1], "Failed to remove wlnimbussetup plist for ")) << lines[1];
    EXPECT_EQ(lines[2], "Failed to find replay keychain item: 2");
    EXPECT_FALSE(fs::exists(home));
}

TEST_F(AgentOnDiskTest, ALaunchAgentsPathThatIsAFileStaysAsItIs) {
    fs::create_directories(home / "Library");
    std::ofstream(agents) << "a file";
    EXPECT_FALSE(store());
    const Lines lines = log.lines();
    ASSERT_EQ(lines.size(), 2U);
    EXPECT_TRUE(startsWith(lines[1], "failed to install com.corvid.welcomer.nimbussetup: ")) << lines[1];
    log.clear();
    EXPECT_EQ(runAgent(), 0);
    EXPECT_TRUE(startsWith(log.lines()[1], "Failed to remove wlnimbussetup plist for ")) << log.lines()[1];
    EXPECT_EQ(log.lines().back(), "exiting");
    EXPECT_EQ(fileContent(agents), "a file");
}

TEST_F(AgentOnDiskTest, ALaunchAgentFileThatIsThereIsNotOverwritten) {
    fs::create_directories(agents);
    std::ofstream(agents / kFileName) << "an earlier one";
    EXPECT_FALSE(store());
    EXPECT_EQ(fileContent(agents / kFileName), "an earlier one");
    EXPECT_TRUE(WLGetNimbusReplayKeychainItem(nullptr, nullptr));
}

TEST_F(AgentOnDiskTest, AWriterThatIsKilledAtAnyMomentHasStoredAllOrNothing) {
    makeHome();
    const PropertyList object(PropertyList::Dictionary{{"large", std::string(4U << 20, 'r')}});
    const auto start = std::chrono::steady_clock::now();
    ASSERT_TRUE(store(object));
    const auto duration = std::chrono::steady_clock::now() - start;
    constexpr int rounds = 60;
    int stored = 0;
    for (int round = 0; round < rounds; ++round) {
        ASSERT_EQ(runAgent(), 0); // takes away what the round before has left
        log.clear();
        const pid_t child = fork();
        if (child == 0) {
            store(object);
            _exit(0);
        }
        std::this_thread::sleep_for(duration * round * 3 / rounds / 2);
        kill(child, SIGKILL);
        statusOf(child);
        PropertyList read;
        if (WLGetNimbusReplayKeychainItem(&read, nullptr)) {
            ++stored;
            EXPECT_TRUE(read == object);
        } else {
            EXPECT_EQ(log.lines(), (Lines{"Failed to find replay keychain item: 2"}));
        }
        const fs::path file = agents / kFileName;
        if (fs::exists(file)) {
            EXPECT_EQ(fileContent(file), fileContent(root / "Setup.app/Resources" / kFileName));
        }
    }
    EXPECT_LT(stored, rounds) << "no round was killed in time";
    EXPECT_TRUE(runAgent() == 0 && store(object)) << "what was left keeps nobody from storing anew";
}

TEST_F(AgentOnDiskTest, OfTwoAgentsAtOnceBothEndWithStatusZeroAndNothingIsLeft) {
    makeHome();
    for (int round = 0; round < 20; ++round) {
        ASSERT_TRUE(store());
        std::array<pid_t, 2> children{};
        for (pid_t& child : children) {
            child = fork();
            if (child == 0) {
                _exit(runAgent());
            }
        }
        for (const pid_t child : children) {
            EXPECT_EQ(statusOf(child), 0);
        }
        EXPECT_FALSE(fs::exists(agents / kFileName));
        EXPECT_FALSE(WLGetNimbusReplayKeychainItem(nullptr, nullptr));
    }
}

TEST_F(AgentOnDiskTest, TheProgramWithoutAReplayItemEndsAtOnceAndRemovesTheLaunchAgentOfItsLabel) {
    const fs::path realHome = buildPlatform()->platform().processIdentity.homeDirectory();
    mountOn(realHome, "1m");
    fs::create_directories(realHome / "Library/LaunchAgents");
    std::ofstream(realHome / "Library/LaunchAgents" / kFileName) << "a launch agent";
    std::ofstream(realHome / "Library/LaunchAgents/mine.plist") << "a launch agent";
    std::ofstream(realHome / "Library/LaunchAgents/second.plist") << "a launch agent";
    const auto start = std::chrono::steady_clock::now();
    EXPECT_EQ(runProgram(WELCOMER_AGENT_PROGRAM, {}), 0);
    EXPECT_FALSE(fs::exists(realHome / "Library/LaunchAgents" / kFileName));
    EXPECT_EQ(runProgram(WELCOMER_AGENT_PROGRAM, {"mine", "second"}), 0);
    EXPECT_LT(std::chrono::steady_clock::now() - start, 60s) << "it lingered";
    EXPECT_EQ(filesBelow(realHome / "Library/LaunchAgents").count("mine.plist"), 0U);
    EXPECT_EQ(filesBelow(realHome / "Library/LaunchAgents").count("second.plist"), 1U);
}

} // namespace
} // namespace welcomer
