// Where the password is while it is checked, and afterwards: nowhere. Not with sanitizers, which keep memory of
// their own.

#include "backends/local/LocalNotificationCenter.h"
#include "backends/local/accounts/LocalAccountService.h"
#include "backends/posix/SecretText.h"
#include "tests/contract/TimeBackends.h"
#include "tests/fakes/FakeFileSystem.h"
#include "tests/fakes/FakeProcessIdentity.h"
#include "tests/fakes/FakeSystemLog.h"
#include "tests/unit/backends/desktop/accountserver/AccountServerFixture.h"

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <malloc.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

namespace welcomer::desktop {
namespace {

// The end of the password as the test keeps it: every byte changed, so that it is not what is looked for. Before it
// stand others: of memory that is freed, the allocator itself overwrites the first bytes.
constexpr char kMasked[] = "\x1b\x2a\x39\x08\x17\x66\x75\x44\x53\x12\x21\x70\x0f\x3e\x4d\x5c\x6b\x7a\x09\x18";
constexpr std::size_t kLength = sizeof(kMasked) - 1;
constexpr char kMask = 0x11;

std::string makePassword() {
    std::string password(4000, 'x');
    password.reserve(password.size() + kLength);
    for (std::size_t i = 0; i < kLength; ++i) {
        password += static_cast<char>(kMasked[i] ^ kMask);
    }
    return password;
}

std::size_t countIn(const char* begin, const char* end) {
    std::size_t count = 0;
    for (const char* at = begin; at + kLength <= end; ++at) {
        std::size_t same = 0;
        while (same < kLength && at[same] == static_cast<char>(kMasked[same] ^ kMask)) {
            ++same;
        }
        count += same == kLength ? 1 : 0;
    }
    return count;
}

// How often the password stands in what this process can write to. Takes no memory: that could be the very piece that
// it was left in.
std::size_t countInMemory() {
    static char maps[1 << 20];
    const posix::FileDescriptor file(::open("/proc/self/maps", O_RDONLY | O_CLOEXEC));
    std::size_t size = 0;
    for (ssize_t more = 1; more > 0; size += static_cast<std::size_t>(more)) {
        more = std::max(ssize_t{0}, ::read(file.get(), maps + size, sizeof(maps) - 1 - size));
    }
    maps[size] = '\0';
    std::size_t count = 0;
    for (const char* line = maps; line && *line != '\0'; line = std::strchr(line, '\n')) {
        line += *line == '\n' ? 1 : 0;
        std::uintptr_t begin = 0;
        std::uintptr_t end = 0;
        char rights[5] = {};
        if (std::sscanf(line, "%lx-%lx %4s", &begin, &end, rights) == 3 && rights[0] == 'r' &&
            rights[1] == 'w') {
            count += countIn(reinterpret_cast<const char*>(begin), reinterpret_cast<const char*>(end));
        }
    }
    return count;
}

// Runs something in a process of its own, which has never seen the password; `result` is what it returns.
int inAnotherProcess(const std::function<int()>& work) {
    const pid_t process = ::fork();
    if (process == 0) {
        ::mallopt(M_TRIM_THRESHOLD, 1 << 30); // what is freed stays, to be looked at
        ::mallopt(M_MMAP_MAX, 0);
        ::_exit(work());
    }
    int status = 0;
    EXPECT_EQ(::waitpid(process, &status, 0), process);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

TEST_F(AccountServerTest, ThePasswordIsNowhereOnceItIsChecked) {
    serve(json(kRightAnswer));
    EXPECT_EQ(inAnotherProcess([this] {
                  const AccountServerClient asked = client();
                  std::string password = makePassword();
                  if (countInMemory() != 1) {
                      return 101; // the search finds what is there
                  }
                  if (!asked.answer("anna", password, {}).isCompleted) {
                      return 102;
                  }
                  posix::wipe(password);
                  return static_cast<int>(countInMemory());
              }),
              0);
    EXPECT_EQ(inAnotherProcess([this] {
                  const auto read = accountserver::decodeAuthenticateRequest(
                      server->requests().at(0).body, accountserver::ContentType::JSON);
                  return read && read.message->password == makePassword() ? 0 : 1;
              }),
              0);
}

TEST_F(AccountServerTest, TheAccountServiceKeepsItNowhereEither) {
    serve(json(kRightAnswer));
    EXPECT_EQ(inAnotherProcess([this] {
                  const AccountServerClient asked = client();
                  contract::LocalTime time;
                  fakes::CallRecorder recorder;
                  fakes::FakeFileSystem fileSystem{recorder};
                  fakes::FakeProcessIdentity identity{recorder, fileSystem};
                  fakes::FakeSystemLog log{recorder};
                  local::LocalNotificationCenter center;
                  local::LocalAccountService service(posix::RootFolder(root.path()), identity, time.runLoops,
                                                     time.dispatchQueues, center, log, &asked);
                  bool isCompleted = false;
                  const auto observation =
                      center.addObserver(platform::kSKNotificationAuthenticationCompleted,
                                         [&](const platform::Notification&) { isCompleted = true; });
                  std::string password = makePassword();
                  service.authenticate("anna", password, {});
                  posix::wipe(password);
                  time.runLoops.current()->run(std::chrono::seconds(60));
                  return isCompleted ? static_cast<int>(countInMemory()) : 102;
              }),
              0);
}

// Says, when it is asked, whether a core file of the process could be written.
struct LookingDirectory final : platform::SignInDirectory {
    platform::SignInAnswer answer(const std::string&, const std::string&,
                                  const PropertyList::Dictionary&) const override {
        return {true, {{"dumpable", ::prctl(PR_GET_DUMPABLE)}}, 0};
    }
    platform::SignInAnswer acceptTerms(const std::string&, const std::string&,
                                       const PropertyList&) const override {
        return {};
    }
    std::string server() const override { return ""; }
    PropertyList::Dictionary servicesOfNewAccount(const std::string&) const override { return {}; }
    std::optional<std::vector<std::string>> userNames() const override { return std::nullopt; }
};

TEST_F(AccountServerTest, NoCoreFileIsWrittenWhileItIsChecked) {
    ASSERT_EQ(::prctl(PR_SET_DUMPABLE, 1), 0);
    const LookingDirectory directory;
    contract::LocalTime time;
    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem{recorder};
    fakes::FakeProcessIdentity identity{recorder, fileSystem};
    fakes::FakeSystemLog log{recorder};
    local::LocalNotificationCenter center;
    local::LocalAccountService service(posix::RootFolder(root.path()), identity, time.runLoops,
                                       time.dispatchQueues, center, log, &directory);
    PropertyList seen;
    const auto observation = center.addObserver(
        platform::kSKNotificationAuthenticationCompleted,
        [&](const platform::Notification& notification) { seen = notification.contents.at("dumpable"); });
    service.authenticate("anna", "secret", {});
    time.runLoops.current()->run(std::chrono::seconds(60));
    EXPECT_EQ(seen, PropertyList(0));
    EXPECT_EQ(::prctl(PR_GET_DUMPABLE), 1);
}

} // namespace
} // namespace welcomer::desktop
