// The version that os-release gives.

#pragma once

#include "platform/FileSystem.h"
#include "platform/SystemVersionInfo.h"

#include <optional>
#include <string>

namespace welcomer::local {

// VERSION_ID of /etc/os-release or, where that cannot be read, of /usr/lib/os-release. Read anew each time: a
// system can be upgraded under a running process.
class LocalSystemVersionInfo final : public platform::SystemVersionInfo {
  public:
    //  fileSystem  borrowed, must outlive this object
    explicit LocalSystemVersionInfo(platform::FileSystem& fileSystem) : _fileSystem(fileSystem) {}

    std::optional<std::string> productVersion() override;

  private:
    platform::FileSystem& _fileSystem;
};

} // namespace welcomer::local
