// The version and the name that os-release gives.

#pragma once

#include "platform/FileSystem.h"
#include "platform/SystemVersionInfo.h"

#include <optional>
#include <string>
#include <string_view>

namespace welcomer::local {

// VERSION_ID and NAME of /etc/os-release or, where that cannot be read, of /usr/lib/os-release. Read anew each time: a
// system can be upgraded under a running process.
class LocalSystemVersionInfo final : public platform::SystemVersionInfo {
  public:
    //  fileSystem  borrowed, must outlive this object
    explicit LocalSystemVersionInfo(platform::FileSystem& fileSystem) : _fileSystem(fileSystem) {}

    std::optional<std::string> productVersion() override { return _value("VERSION_ID="); }

    // What the system is called, for example "Debian GNU/Linux", or none when it does not say. Any thread.
    std::optional<std::string> productName() { return _value("NAME="); }

  private:
    std::optional<std::string> _value(std::string_view assignment);

    platform::FileSystem& _fileSystem;
};

} // namespace welcomer::local
