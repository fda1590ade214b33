// The agent on the local backend, killed at every system call between its start and its linger.

#include "agent/wlnimbussetup.h"
#include "backends/Backends.h"
#include "backends/simulated/VirtualTime.h"
#include "cloud/WLNimbusServiceCatalogue.h"
#include "handoff/LaunchAgentFile.h"
#include "handoff/ReplayItem.h"
#include "handoff/WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup.h"
#include "plugins/WLFirstRunDelegateConfiguration.h"
#include "propertylist/PropertyListReader.h"
#include "propertylist/PropertyListWriter.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/PluginRegistry.h"
#include "tools/launch-agents/LaunchAgentFolder.h"
#include "tools/launch-agents/offerAgain.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <functional>
#include <gtest/gtest.h>
#include <memory>
#include <sstream>
#include <string>
#include <sys/ptrace.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

namespace welcomer {
namespace {

namespace fs = std::filesystem;

constexpr char kIdentifier[] = "com.corvid.storefront";
constexpr int kSystemCallStop = SIGTRAP | 0x80;

void append(const std::string& path, const std::string& line) {
    const int file = ::open(path.c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0600);
    const std::string text = line + '\n';
    if (::write(file, text.data(), text.size()) != static_cast<ssize_t>(text.size())) {
        ::_exit(99);
    }
    ::close(file);
}

// Keeps the log in a file, and gives a signal when the linger begins.
class FileLog final : public platform::SystemLog {
  public:
    explicit FileLog(std::string path) : _path(std::move(path)) {}

    void write(int /*priority*/, const std::string& message) override {
        append(_path, message);
        if (signalsLinger && message == "delaying exit by two minutes") {
            ::raise(SIGUSR1);
        }
    }

    bool signalsLinger = false;

  private:
    const std::string _path;
};

// Notes in a file that it was handed its response.
class ActingDelegate final : public WLFirstRunDelegateConfiguration {
  public:
    explicit ActingDelegate(std::string path) : _path(std::move(path)) {}

    std::optional<std::string> delegateIdentifier() override { return kIdentifier; }
    std::optional<PropertyList> delegateSetupRequest() override { return std::nullopt; }
    void completeSetupWithResponseHandler(const PropertyList& /*response*/,
                                          CompletionHandler handler) override {
        append(_path, "acted");
        handler(true, std::nullopt);
    }
    void
    completeSetupWithResponseChosenAliasesHandler(const PropertyList& response,
                                                  const std::optional<std::vector<std::string>>& /*aliases*/,
                                                  CompletionHandler handler) override {
        completeSetupWithResponseHandler(response, std::move(handler));
    }
    std::optional<std::vector<std::string>> messagingAliasesFromResponse(const PropertyList&) override {
        return std::nullopt;
    }
    std::string className() const override { return "ActingDelegate"; }

  private:
    const std::string _path;
};

// A keyring that nobody can be asked to unlock.
class LockedStore final : public platform::CredentialStore {
  public:
    platform::CredentialOutcome createItem(const platform::CredentialItem& /*item*/,
                                           const std::string& /*data*/) override {
        return {platform::kCredentialLocked};
    }
    platform::CredentialFinding findItem(const std::string& /*service*/, const std::string& /*account*/,
                                         platform::CredentialWish /*wish*/) override {
        platform::CredentialFinding found;
        found.status = platform::kCredentialLocked;
        return found;
    }
    std::int32_t deleteItem(const platform::CredentialItemReference& /*reference*/) override {
        return platform::kCredentialLocked;
    }
};

// A home after setup: an account with every service, the replay item and the launch agent.
class Home {
  public:
    Home() {
        fs::create_directories(root.locate("/Setup.app"));
        fs::copy(fs::path(WELCOMER_SETUP_BUNDLE) / "Resources", root.locate("/Setup.app/Resources"),
                 fs::copy_options::recursive);
        root.addDirectory(home);
        PropertyList::Dictionary services;
        for (const std::string& identifier : WLNimbusAllSetupServiceIDs()) {
            services[identifier] = PropertyList::Dictionary{
                {"Properties",
                 PropertyList::Dictionary{{platform::kSKPropertyMailEmailAddress, "anna@example.org"}}}};
        }
        root.addFile(accountFile(),
                     *writeXMLPropertyList(PropertyList::Dictionary{
                         {"Accounts", PropertyList::Dictionary{
                                          {"anna", PropertyList::Dictionary{{"Services", services}}}}}}));
        const platform::ScopedPlatform installed(owner->platform());
        const auto bundle = owner->platform().resourceBundles.open("/Setup.app");
        isReady = WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup(
            "anna",
            PropertyList::Dictionary{
                {kReplayResponsesKey,
                 PropertyList::Dictionary{
                     {platform::kDelegatesKey, PropertyList::Dictionary{{kIdentifier, "response"}}}}}},
            *bundle);
    }

    std::string accountFile() const { return home + "/Library/Accounts/Accounts.plist"; }

    // Runs the agent in this process.
    int runAgent(const platform::Platform& platform) const {
        const platform::ScopedPlatform installed(platform);
        fakes::fillPluginRegistry({std::make_shared<ActingDelegate>(root.locate("/acts"))});
        const std::array<const char*, 2> arguments{"wlnimbussetup", nullptr};
        return wlnimbussetup(1, arguments.data());
    }

    // A login, from its start to its end, on simulated time.
    int logIn() const {
        return run([this] {
            simulated::VirtualTime time;
            FileLog log(root.locate("/log"));
            const auto platform = buildPlatform({.root = root.path(),
                                                 .systemLog = &log,
                                                 .clock = &time,
                                                 .runLoops = &time,
                                                 .dispatchQueues = &time});
            return runAgent(platform->platform());
        });
    }

    // Whether the credential store can be asked at a login.
    enum class Keyring { Open, Locked };

    // A login that is killed before a system call, counted from 1.
    //  result  false when the agent ended or the linger began first; it is killed in the linger
    bool logInAndKillAt(int number, Keyring keyring = Keyring::Open) const {
        const pid_t child = start([&] {
            FileLog log(root.locate("/log"));
            log.signalsLinger = true;
            const auto platform = buildPlatform({.root = root.path(), .systemLog = &log});
            LockedStore locked;
            const platform::Platform chosen =
                keyring == Keyring::Locked ? withStore(platform->platform(), locked) : platform->platform();
            ::ptrace(PTRACE_TRACEME, 0, nullptr, nullptr);
            ::raise(SIGSTOP);
            return runAgent(chosen);
        });
        return killTraced(child, number, keyring == Keyring::Open);
    }

    // What the launch service does after that login, with what the agent has logged.
    //  result  whether the agent is offered again
    bool offerAgain(const launch::LaunchAgent& agent) const {
        std::vector<std::string> lines;
        std::istringstream text(root.content("/log").value_or(""));
        for (std::string line; std::getline(text, line);) {
            lines.push_back(line);
        }
        const auto status = launch::statusOfUnaskedItem(lines);
        if (status) {
            const platform::ScopedPlatform installed(owner->platform());
            launch::putBack(root.locate(launchAgentsFolder(home)), agent, *status);
        }
        return status.has_value();
    }

    // The agent's definition as the launch service reads it before the start.
    launch::LaunchAgent readAgent() const {
        const platform::ScopedPlatform installed(owner->platform());
        const auto agents = launch::readLaunchAgents(root.locate(launchAgentsFolder(home)), ::geteuid());
        return agents.empty() ? launch::LaunchAgent() : agents.front();
    }

    bool hasReplayItem() const {
        const platform::ScopedPlatform installed(owner->platform());
        return WLGetNimbusReplayKeychainItem(nullptr, nullptr);
    }
    bool hasLaunchAgent() const {
        return fs::exists(root.locate(home + "/Library/LaunchAgents/" + kLaunchAgentLabel + ".plist"));
    }

    // The services in the account file; none when it is torn.
    std::optional<PropertyList::Dictionary> services() const {
        const PropertyListReadResult file = readPropertyList(root.content(accountFile()).value_or("nothing"));
        const PropertyList* value = file ? &*file.value : nullptr;
        for (const char* key : {"Accounts", "anna", "Services"}) {
            value = value ? value->find(key) : nullptr;
        }
        return value && value->isDictionary() ? std::optional(*value->dictionary()) : std::nullopt;
    }

    // How often a line stands in one of the root's files.
    long count(const std::string& file, const std::string& line) const {
        const std::string text = '\n' + root.content(file).value_or("");
        long result = 0;
        for (std::size_t at = text.find('\n' + line + '\n'); at != std::string::npos;
             at = text.find('\n' + line + '\n', at + 1)) {
            ++result;
        }
        return result;
    }
    long acts() const { return count("/acts", "acted"); }

    TemporaryRoot root;
    FileLog setupLog{root.locate("/setup-log")};
    std::unique_ptr<PlatformOwner> owner = buildPlatform({.root = root.path(), .systemLog = &setupLog});
    const std::string home = owner->platform().processIdentity.homeDirectory();
    bool isReady = false;

  private:
    static pid_t start(const std::function<int()>& block) {
        const pid_t child = ::fork();
        if (child == 0) {
            ::_exit(block());
        }
        return child;
    }

    static int run(const std::function<int()>& block) {
        const pid_t child = start(block);
        int status = 0;
        while (::waitpid(child, &status, 0) < 0 && errno == EINTR) {
        }
        return status;
    }

    static bool isAtSystemCallEntry(pid_t thread) {
        struct __ptrace_syscall_info information = {};
        return ::ptrace(PTRACE_GET_SYSCALL_INFO, thread, sizeof(information), &information) > 0 &&
               information.op == PTRACE_SYSCALL_INFO_ENTRY;
    }

    static platform::Platform withStore(const platform::Platform& of, platform::CredentialStore& store) {
        return {.systemLog = of.systemLog,
                .fileSystem = of.fileSystem,
                .processIdentity = of.processIdentity,
                .credentialStore = store,
                .pluginBundle = of.pluginBundle,
                .resourceBundles = of.resourceBundles,
                .clock = of.clock,
                .runLoops = of.runLoops,
                .dispatchQueues = of.dispatchQueues,
                .preferenceStore = of.preferenceStore,
                .systemVersionInfo = of.systemVersionInfo,
                .hostReachability = of.hostReachability,
                .notificationCenter = of.notificationCenter,
                .accountService = of.accountService,
                .processLauncher = of.processLauncher,
                .networkConfigStore = of.networkConfigStore,
                .networkStateStore = of.networkStateStore,
                .directoryService = of.directoryService};
    }

    // Counts the system calls of all of the agent's threads.
    static bool killTraced(pid_t child, int number, bool lingers) {
        int status = 0;
        ::waitpid(child, &status, 0); // the stop that it gave itself
        ::ptrace(PTRACE_SETOPTIONS, child, nullptr,
                 PTRACE_O_TRACESYSGOOD | PTRACE_O_TRACECLONE | PTRACE_O_EXITKILL);
        ::ptrace(PTRACE_SYSCALL, child, nullptr, nullptr);
        int calls = 0;
        bool hasLingered = false;
        for (;;) {
            const pid_t thread = ::waitpid(-1, &status, __WALL);
            if (thread < 0) {
                return !hasLingered;
            }
            if (!WIFSTOPPED(status)) {
                if (thread == child) {
                    EXPECT_TRUE(WIFSIGNALED(status) || !lingers) << "the agent ended by itself";
                    return !hasLingered && WIFSIGNALED(status);
                }
                continue;
            }
            long delivered = 0;
            const int signal = WSTOPSIG(status);
            if (signal == kSystemCallStop) {
                calls += isAtSystemCallEntry(thread) ? 1 : 0;
                if (calls == number) {
                    ::kill(child, SIGKILL);
                }
            } else if (signal == SIGUSR1) {
                hasLingered = true;
                ::kill(child, SIGKILL);
            } else if (signal != SIGSTOP && signal != SIGTRAP) { // a new thread's first stop, an event
                delivered = signal;
            }
            ::ptrace(PTRACE_SYSCALL, thread, nullptr, delivered);
        }
    }
};

TEST(AgentKillTest, KilledAtAnySystemCallNoItemIsActedOnTwiceAndTheAccountFileIsNeverTorn) {
    bool actedInTheSecondLogin = false;
    bool actedInNone = false;
    bool actedInTheFirst = false;
    int number = 0;
    for (bool wasKilledBefore = true; wasKilledBefore;) {
        ++number;
        const Home home;
        ASSERT_TRUE(home.isReady);
        const launch::LaunchAgent agent = home.readAgent();
        wasKilledBefore = home.logInAndKillAt(number);
        SCOPED_TRACE("killed at system call " + std::to_string(number));
        ASSERT_FALSE(home.offerAgain(agent)) << "though it may have read its item";

        const long actsOfTheFirst = home.acts();
        const bool hadItem = home.hasReplayItem();
        ASSERT_TRUE(home.services()) << home.root.content(home.accountFile()).value_or("gone");
        ASSERT_EQ(home.services()->size(), 10U);
        ASSERT_FALSE(hadItem && actsOfTheFirst > 0) << "acted on while it could be read again";
        ASSERT_FALSE(hadItem && home.count("/log", "Killing onlineaccounts") > 0);

        ASSERT_EQ(home.logIn(), 0);
        ASSERT_EQ(home.acts(), hadItem ? 1 : actsOfTheFirst);
        ASSERT_LE(home.acts(), 1);
        ASSERT_LE(home.count("/log", "Enabling post-login services for account anna"), 1);
        ASSERT_FALSE(home.hasReplayItem());
        ASSERT_FALSE(home.hasLaunchAgent());
        ASSERT_TRUE(home.services());
        ASSERT_EQ(home.services()->size(), 10U);

        actedInTheSecondLogin = actedInTheSecondLogin || hadItem;
        actedInNone = actedInNone || home.acts() == 0;
        actedInTheFirst = actedInTheFirst || actsOfTheFirst == 1;
    }
    EXPECT_TRUE(actedInTheSecondLogin);
    EXPECT_TRUE(actedInNone);
    EXPECT_TRUE(actedInTheFirst);
    EXPECT_GT(number, 100);
    RecordProperty("SystemCalls", number);
}

TEST(AgentKillTest, KilledAtAnySystemCallAnAgentThatCouldNotAskIsOfferedAtMostOnceAndThenActsOnce) {
    bool wasEverOffered = false;
    bool wasEverLost = false;
    int number = 0;
    for (bool wasKilled = true; wasKilled;) {
        ++number;
        const Home home;
        ASSERT_TRUE(home.isReady);
        const launch::LaunchAgent agent = home.readAgent();
        wasKilled = home.logInAndKillAt(number, Home::Keyring::Locked);
        SCOPED_TRACE("killed at system call " + std::to_string(number));
        ASSERT_EQ(home.acts(), 0);
        const bool hadFile = home.hasLaunchAgent();
        const bool wasOffered = home.offerAgain(agent);
        ASSERT_EQ(home.hasLaunchAgent(), hadFile || wasOffered);
        ASSERT_TRUE(home.hasReplayItem());
        wasEverOffered = wasEverOffered || wasOffered;
        wasEverLost = wasEverLost || !home.hasLaunchAgent();
        if (home.hasLaunchAgent()) {
            ASSERT_EQ(home.logIn(), 0);
            ASSERT_EQ(home.acts(), 1);
            ASSERT_FALSE(home.offerAgain(agent));
            ASSERT_FALSE(home.hasLaunchAgent());
        }
    }
    EXPECT_TRUE(wasEverOffered);
    EXPECT_TRUE(wasEverLost);
    EXPECT_GT(number, 10);
}

} // namespace
} // namespace welcomer
