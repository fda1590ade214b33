// A process identity that tests choose.

#pragma once

#include "platform/ProcessIdentity.h"
#include "tests/fakes/CallRecorder.h"
#include "tests/fakes/FakeFileSystem.h"

#include <mutex>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::fakes {

// The user 1000, "user", at home in "/home/user" until a test says otherwise; makes the library folder in the
// fake file system. Recorded as "ProcessIdentity.loginName" and so on. Any thread.
class FakeProcessIdentity final : public platform::ProcessIdentity {
  public:
    FakeProcessIdentity(CallRecorder& recorder, FakeFileSystem& fileSystem)
        : _recorder(recorder),
          _fileSystem(fileSystem) {}

    uid_t effectiveUserID() override;
    std::string loginName() override;
    std::string homeDirectory() override;

    // "<home>/Library" unless a test has set the list.
    std::vector<std::string> userLibraryDirectories() override;

    void setEffectiveUserID(uid_t userID);
    void setLoginName(const std::string& loginName);
    void setHomeDirectory(const std::string& path); // empty: the user has none
    void setUserLibraryDirectories(const std::vector<std::string>& paths);

  private:
    CallRecorder& _recorder;
    FakeFileSystem& _fileSystem;
    mutable std::mutex _mutex;
    uid_t _userID = 1000;
    std::string _loginName = "user";
    std::string _homeDirectory = "/home/user";
    std::optional<std::vector<std::string>> _libraryDirectories;
};

} // namespace welcomer::fakes
