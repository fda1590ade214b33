// The settings that the platform was built with or given, and where each comes from: for people.

#pragma once

#include <string>
#include <vector>

namespace welcomer::platform {

// Every text is one line.
struct SettingReport {
    std::string name;   // as it stands in the settings files
    std::string value;  // the one that holds
    std::string origin; // the file that it was read from, the setting that it follows, or "the build"
    friend bool operator==(const SettingReport&, const SettingReport&) = default;
};

struct SettingsReport {
    std::vector<SettingReport> settings;
    std::vector<std::string> problems; // what in the files makes no sense and is passed over
};

} // namespace welcomer::platform
