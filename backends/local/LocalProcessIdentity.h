// The effective user of this process, as the password database knows it.

#pragma once

#include "backends/posix/RootFolder.h"
#include "platform/ProcessIdentity.h"

#include <mutex>

namespace welcomer::local {

// The password database is this machine's own; the home folder that it names is looked up below the root. It
// is read once, when a name or a folder is first asked.
class LocalProcessIdentity final : public platform::ProcessIdentity {
  public:
    explicit LocalProcessIdentity(posix::RootFolder root) : _root(std::move(root)) {}

    std::uint32_t effectiveUserID() override;
    std::string loginName() override;
    std::string homeDirectory() override;
    std::vector<std::string> userLibraryDirectories() override;

  private:
    void _readEntry();

    const posix::RootFolder _root;
    std::once_flag _entryRead;
    std::string _loginName;
    std::string _homeDirectory; // empty: there is none
    std::string _whyNoHome;     // the system's reason, where it has one
};

} // namespace welcomer::local
