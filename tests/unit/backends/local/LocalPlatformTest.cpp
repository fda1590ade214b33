#include "backends/Backends.h"
#include "backends/simulated/VirtualTime.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeSystemLog.h"
#include "tests/support/SystemCallFaults.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <iterator>

namespace welcomer {

namespace {

std::ptrdiff_t threadCount() {
    return std::distance(std::filesystem::directory_iterator("/proc/self/task"), {});
}

} // namespace

TEST(LocalPlatformTest, BuildingMakesNoSystemCallAndNoThread) {
    const std::ptrdiff_t threads = threadCount();

    SystemCallFaults::count();
    const std::unique_ptr<PlatformOwner> owner = buildPlatform();
    EXPECT_EQ(SystemCallFaults::stop(), std::vector<std::string>{});

    EXPECT_EQ(threadCount(), threads);
}

TEST(LocalPlatformTest, EveryServiceLooksBelowTheRoot) {
    const TemporaryRoot root;
    const std::unique_ptr<PlatformOwner> owner = buildPlatform({root.path()});
    const platform::Platform& platform = owner->platform();
    const std::string home = platform.processIdentity.homeDirectory();
    root.addDirectory(home);
    root.addFile("/Setup.app/Resources/agent", "text");
    root.addFile("/etc/os-release", "VERSION_ID=\"1.2.3\"\n");

    EXPECT_EQ(platform.processIdentity.userLibraryDirectories(), std::vector{home + "/Library"});
    EXPECT_TRUE(std::filesystem::is_directory(root.locate(home + "/Library")));
    EXPECT_TRUE(platform.fileSystem.exists("/Setup.app"));
    EXPECT_EQ(platform.resourceBundles.open("/Setup.app")->pathForResource("agent", ""),
              "/Setup.app/Resources/agent");
    EXPECT_EQ(platform.credentialStore.createItem({"service", "account", "", std::nullopt}, "secret"), 0);
    EXPECT_TRUE(std::filesystem::exists(root.locate(home + "/Library/Credentials/Items.plist")));
    EXPECT_EQ(platform.systemVersionInfo.productVersion(), "1.2.3");
    platform.preferenceStore.setValue("key", "value", "com.corvid.test");
    EXPECT_TRUE(platform.preferenceStore.synchronise("com.corvid.test"));
    EXPECT_TRUE(std::filesystem::exists(root.locate(home + "/Library/Preferences")));
    EXPECT_NE(platform.pluginBundle.load("/Setup.app/Resources/agent", "symbol").reason, "");
}

TEST(LocalPlatformTest, TimePassesOnTheGivenServices) {
    simulated::VirtualTime time;
    const std::unique_ptr<PlatformOwner> owner =
        buildPlatform({.clock = &time, .runLoops = &time, .dispatchQueues = &time});
    const platform::Platform& platform = owner->platform();

    EXPECT_EQ(&platform.clock, &time);
    EXPECT_EQ(&platform.runLoops, &time);
    EXPECT_EQ(&platform.dispatchQueues, &time);
}

TEST(LocalPlatformTest, RecordsGoToTheGivenLog) {
    fakes::CallRecorder recorder;
    fakes::FakeSystemLog log(recorder);
    const std::unique_ptr<PlatformOwner> owner = buildPlatform({"/", &log});

    owner->platform().systemLog.write(115, "message");

    EXPECT_EQ(log.lines(), std::vector<std::string>{"message"});
}

} // namespace welcomer
