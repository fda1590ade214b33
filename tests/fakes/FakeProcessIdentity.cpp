#include "tests/fakes/FakeProcessIdentity.h"

#include "platform/Error.h"

namespace welcomer::fakes {

uid_t FakeProcessIdentity::effectiveUserID() {
    _recorder.record("ProcessIdentity.effectiveUserID");
    const std::lock_guard lock(_mutex);
    return _userID;
}

std::string FakeProcessIdentity::loginName() {
    _recorder.record("ProcessIdentity.loginName");
    const std::lock_guard lock(_mutex);
    return _loginName;
}

std::string FakeProcessIdentity::homeDirectory() {
    _recorder.record("ProcessIdentity.homeDirectory");
    const std::lock_guard lock(_mutex);
    if (_homeDirectory.empty()) {
        throw platform::Exception("the user " + _loginName + " has no home folder");
    }
    return _homeDirectory;
}

std::vector<std::string> FakeProcessIdentity::userLibraryDirectories() {
    _recorder.record("ProcessIdentity.userLibraryDirectories");
    const std::lock_guard lock(_mutex);
    if (_libraryDirectories) {
        return *_libraryDirectories;
    }
    if (_homeDirectory.empty()) {
        return {};
    }
    const std::string path = (_homeDirectory == "/" ? "" : _homeDirectory) + "/Library";
    if (_fileSystem.isDirectory(_homeDirectory) && !_fileSystem.isDirectory(path)) {
        _fileSystem.addDirectory(path, 0700);
    }
    return {path};
}

void FakeProcessIdentity::setEffectiveUserID(uid_t userID) {
    const std::lock_guard lock(_mutex);
    _userID = userID;
}

void FakeProcessIdentity::setLoginName(const std::string& loginName) {
    const std::lock_guard lock(_mutex);
    _loginName = loginName;
}

void FakeProcessIdentity::setHomeDirectory(const std::string& path) {
    const std::lock_guard lock(_mutex);
    _homeDirectory = path;
}

void FakeProcessIdentity::setUserLibraryDirectories(const std::vector<std::string>& paths) {
    const std::lock_guard lock(_mutex);
    _libraryDirectories = paths;
}

} // namespace welcomer::fakes
