// Which system this is.

#pragma once

#include <optional>
#include <string>

namespace welcomer::platform {

class SystemVersionInfo {
  public:
    virtual ~SystemVersionInfo() = default;

    // The running system's product version, for example "12" or "24.04", or none when the system does not
    // say. Any thread; may read a file.
    virtual std::optional<std::string> productVersion() = 0;
};

} // namespace welcomer::platform
