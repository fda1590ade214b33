#include "backends/local/LocalSettings.h"

#include "backends/posix/FileContent.h"
#include "generated/WelcomerConfiguration.h"

#include <algorithm>
#include <cerrno>
#include <string_view>
#include <system_error>

namespace welcomer::local {

namespace {

// By Setting.
constexpr std::array<std::string_view, kSettingCount> kBuiltIn = {"",
                                                                  "",
                                                                  "10",
                                                                  "",
                                                                  "30",
                                                                  configuration::kOnlineAccountProvider,
                                                                  configuration::kOnlineAccountServer,
                                                                  configuration::kPluginFolder};

constexpr char kOfTheBuild[] = "the build";

} // namespace

const std::string& LocalSettings::value(Setting setting) {
    std::call_once(_isRead, [this] { _read(); });
    return _report.settings[static_cast<std::size_t>(setting)].value;
}

platform::SettingsReport LocalSettings::report() {
    std::call_once(_isRead, [this] { _read(); });
    return _report;
}

void LocalSettings::_read() {
    for (std::size_t i = 0; i < kSettingCount; ++i) {
        _report.settings.push_back({nameOf(static_cast<Setting>(i)), std::string(kBuiltIn[i]), kOfTheBuild});
    }
    std::for_each(kSettingsFiles.rbegin(), kSettingsFiles.rend(),
                  [this](const char* path) { _readFile(path); });
    _followAccountServer();
    for (const std::string& problem : _report.problems) {
        _log.write(platform::kErrorPriority, problem);
    }
}

// The password that one server has accepted is given to no other that nobody has named.
void LocalSettings::_followAccountServer() {
    const platform::SettingReport& asked = _report.settings[static_cast<std::size_t>(Setting::AccountServer)];
    platform::SettingReport& online =
        _report.settings[static_cast<std::size_t>(Setting::OnlineAccountServer)];
    if (online.origin == kOfTheBuild && asked.value.starts_with("https://")) {
        online.value = asked.value + (asked.value.ends_with('/') ? "" : "/");
        online.origin = asked.name;
    }
}

void LocalSettings::_readFile(const char* path) {
    std::string content;
    const int error = posix::readFile(_root, path, content, kMaximumSettingsSize);
    if (error == ENOENT || error == ENOTDIR) {
        return;
    }
    if (error != 0) {
        _report.problems.push_back(std::string(path) + ": " + std::generic_category().message(error));
        return;
    }
    const SettingsText read = readSettings(content);
    for (std::size_t i = 0; i < kSettingCount; ++i) {
        if (read.values[i]) {
            _report.settings[i].value = *read.values[i];
            _report.settings[i].origin = path;
        }
    }
    for (const std::string& problem : read.problems) {
        _report.problems.push_back(std::string(path) + ", " + problem);
    }
}

} // namespace welcomer::local
