#include "backends/local/LocalSettings.h"

#include "generated/WelcomerConfiguration.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeSystemLog.h"
#include "tests/support/SystemCallFaults.h"

#include <gtest/gtest.h>

namespace welcomer::local {
namespace {

using Texts = std::vector<std::string>;

constexpr char kAdministrators[] = "/etc/welcomer/platform.conf";
constexpr char kDelivered[] = "/usr/share/welcomer/platform.conf";

class LocalSettingsTest : public testing::Test {
  protected:
    platform::SettingReport reported(Setting setting) {
        return settings.report().settings.at(static_cast<std::size_t>(setting));
    }

    TemporaryRoot files;
    posix::RootFolder root{files.path()};
    fakes::CallRecorder recorder;
    fakes::FakeSystemLog log{recorder};
    LocalSettings settings{root, log};
};

} // namespace

TEST_F(LocalSettingsTest, WithoutAFileTheBuildsValuesHold) {
    EXPECT_EQ(settings.value(Setting::OnlineAccountProvider), configuration::kOnlineAccountProvider);
    EXPECT_EQ(settings.value(Setting::OnlineAccountServer), configuration::kOnlineAccountServer);
    EXPECT_EQ(settings.value(Setting::PluginFolder), configuration::kPluginFolder);
    EXPECT_EQ(settings.value(Setting::AccountServer), "");
    EXPECT_EQ(settings.value(Setting::AccountServerAuthority), "");
    EXPECT_EQ(settings.value(Setting::AccountServerConnectSeconds), "10");
    EXPECT_EQ(settings.value(Setting::AccountServerRevocations), "");
    EXPECT_EQ(settings.value(Setting::AccountServerSeconds), "30");
    EXPECT_EQ(
        reported(Setting::PluginFolder),
        (platform::SettingReport{"PluginFolder", std::string(configuration::kPluginFolder), "the build"}));
    EXPECT_EQ(log.lines(), Texts{});
}

TEST_F(LocalSettingsTest, TheAdministratorsFileHoldsOverTheDeliveredOneLineByLine) {
    files.addFile(kDelivered, "OnlineAccountProvider=delivered\nPluginFolder=/delivered\n");
    files.addFile(kAdministrators, "PluginFolder=/administrators\n");
    EXPECT_EQ(reported(Setting::PluginFolder),
              (platform::SettingReport{"PluginFolder", "/administrators", kAdministrators}));
    EXPECT_EQ(reported(Setting::OnlineAccountProvider),
              (platform::SettingReport{"OnlineAccountProvider", "delivered", kDelivered}));
    EXPECT_EQ(reported(Setting::OnlineAccountServer).origin, "the build");
}

TEST_F(LocalSettingsTest, AValueThatMakesNoSenseLeavesTheOneBelowAndIsLoggedOnce) {
    files.addFile(kDelivered, "PluginFolder=/delivered\n");
    files.addFile(kAdministrators, "\nPluginFolder=administrators\n");
    EXPECT_EQ(settings.value(Setting::PluginFolder), "/delivered");
    EXPECT_EQ(settings.value(Setting::PluginFolder), "/delivered");
    const Texts expected{"/etc/welcomer/platform.conf, line 2: PluginFolder is not the path of a folder, "
                         "which begins with /"};
    EXPECT_EQ(settings.report().problems, expected);
    EXPECT_EQ(log.lines(), expected);
    EXPECT_EQ(log.records().front().priority, platform::kErrorPriority);
}

TEST_F(LocalSettingsTest, OnlineAccountsAreMadeWithTheAccountServerUnlessSomebodyNamesAnother) {
    const auto onlineWith = [this](const std::string& lines) {
        files.addFile(kAdministrators, lines);
        return LocalSettings(root, log)
            .report()
            .settings[static_cast<std::size_t>(Setting::OnlineAccountServer)];
    };
    EXPECT_EQ(
        onlineWith("AccountServer=https://accounts.example:8443\n"),
        (platform::SettingReport{"OnlineAccountServer", "https://accounts.example:8443/", "AccountServer"}));
    EXPECT_EQ(onlineWith("AccountServer=https://accounts.example/a/\n").value, "https://accounts.example/a/");
    EXPECT_EQ(onlineWith("AccountServer=https://a.example\nOnlineAccountServer=https://b.example/\n").value,
              "https://b.example/");
    EXPECT_EQ(onlineWith("AccountServer=unix:/run/a\n").origin, "the build");
}

TEST_F(LocalSettingsTest, AFileThatCannotBeReadIsLoggedAndCostsNoOther) {
    files.addDirectory(kAdministrators);
    files.addFile(kDelivered, "PluginFolder=/delivered\n");
    EXPECT_EQ(settings.value(Setting::PluginFolder), "/delivered");
    EXPECT_EQ(log.lines(), Texts{"/etc/welcomer/platform.conf: Invalid argument"});
}

TEST_F(LocalSettingsTest, AFileThatIsTooLongIsNotRead) {
    const std::string line = "PluginFolder=/a\n";
    const std::string longest = line + std::string(kMaximumSettingsSize - line.size(), '\n');
    files.addFile(kDelivered, longest);
    files.addFile(kAdministrators, longest + "\n");
    EXPECT_EQ(reported(Setting::PluginFolder).origin, kDelivered);
    EXPECT_EQ(log.lines(), Texts{"/etc/welcomer/platform.conf: File too large"});
}

TEST_F(LocalSettingsTest, NothingIsReadBeforeItIsWanted) {
    SystemCallFaults::count();
    const LocalSettings unused(root, log);
    EXPECT_EQ(SystemCallFaults::stop(), Texts{});
    files.addFile(kAdministrators, "PluginFolder=/later\n");
    EXPECT_EQ(settings.value(Setting::PluginFolder), "/later");
}

} // namespace welcomer::local
