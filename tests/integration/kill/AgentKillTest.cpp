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

#include <array>
#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <functional>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <sys/ptrace.h>
#include <sys/wait.h>
#include <unistd.h>

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

    // A login that is killed before a system call, counted from 1.
    //  result  false when the linger began first; the agent is killed then
    bool logInAndKillAt(int number) const {
        const pid_t child = start([this] {
            FileLog log(root.locate("/log"));
            log.signalsLinger = true;
            const auto platform = buildPlatform({.root = root.path(), .systemLog = &log});
            ::ptrace(PTRACE_TRACEME, 0, nullptr, nullptr);
            ::raise(SIGSTOP);
            return runAgent(platform->platform());
        });
        return killTraced(child, number);
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

    // Counts the system calls of all of the agent's threads.
    static bool killTraced(pid_t child, int number) {
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
                    EXPECT_TRUE(WIFSIGNALED(status)) << "the agent ended by itself";
                    return !hasLingered;
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
        wasKilledBefore = home.logInAndKillAt(number);
        SCOPED_TRACE("killed at system call " + std::to_string(number));

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

} // namespace
} // namespace welcomer
