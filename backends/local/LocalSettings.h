// The settings of a machine: what an administrator has set, over what was delivered, over what was built in.

#pragma once

#include "backends/local/SettingsText.h"
#include "backends/posix/RootFolder.h"
#include "platform/SettingsReport.h"
#include "platform/SystemLog.h"

#include <array>
#include <mutex>
#include <string>

namespace welcomer::local {

// The files, each of which holds over those behind it.
inline constexpr std::array<const char*, 2> kSettingsFiles = {"/etc/welcomer/platform.conf",
                                                              "/usr/share/welcomer/platform.conf"};

// Any thread.
class LocalSettings {
  public:
    // Reads nothing.
    //  root, log  borrowed
    LocalSettings(const posix::RootFolder& root, platform::SystemLog& log) : _root(root), _log(log) {}

    // The value of a setting. The first question reads the files, with a line in the system log for everything
    // in them that makes no sense; what changes in them afterwards is not seen.
    //  result  lives as long as this object
    const std::string& value(Setting setting);

    // All of them, and what was wrong with the files. Reads them as above.
    platform::SettingsReport report();

  private:
    void _read();
    void _readFile(const char* path);
    void _followAccountServer();

    const posix::RootFolder& _root;
    platform::SystemLog& _log;
    std::once_flag _isRead;
    platform::SettingsReport _report; // by Setting
};

} // namespace welcomer::local
