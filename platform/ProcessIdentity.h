// Who runs this process. Home and login name are the password database's; no environment variable is asked.

#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace welcomer::platform {

// Any thread.
class ProcessIdentity {
  public:
    virtual ~ProcessIdentity() = default;

    virtual std::uint32_t effectiveUserID() = 0;

    // The login name of the effective user, or the user id in decimal when the password database has no
    // entry.
    virtual std::string loginName() = 0;

    // The home folder of the effective user, an absolute path. Throws Exception, with a text for people, when
    // the password database has none: nothing stands in for it.
    virtual std::string homeDirectory() = 0;

    // The library folders in the user's domain, the first being the one to use; none for a user without a
    // home folder. A leading "~" may stand for the home folder. The platform makes the folder where it is
    // missing (mode 0700) and the home folder exists; when that fails the path is given all the same.
    virtual std::vector<std::string> userLibraryDirectories() = 0;
};

} // namespace welcomer::platform
