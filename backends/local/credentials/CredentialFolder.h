// The folder and the file that a local credential store consists of.

#pragma once

#include "backends/posix/FileDescriptor.h"
#include "backends/posix/FileLock.h"
#include "backends/posix/RootFolder.h"
#include "platform/CredentialStore.h"
#include "propertylist/PropertyList.h"

#include <cstdint>
#include <string>

namespace welcomer::local {

// Every failure but that of a missing folder says which path it is about. One thread at a time.
class CredentialFolder {
  public:
    // Opens the folder.
    //  result  kCredentialItemNotFound when there is no folder, kCredentialStoreUnsafe, kCredentialReadFailed
    platform::CredentialOutcome open(const posix::RootFolder& root, const std::string& path);

    // Waits for the other writers to finish and keeps them out until this object is gone; clears away what a
    // killed one left.
    //  path    of the lock file
    //  result  kCredentialStoreInUse when they do not let go of it, kCredentialWriteFailed
    platform::CredentialOutcome lock(const posix::RootFolder& root, const std::string& path);

    // Reads the items. Each is a dictionary that itemMatches() and the rest of CredentialItemFormat.h
    // understand.
    //  complaint  receives a line where others could read the file, which is the user's alone from then on; null:
    //             it stays as it is
    //  result     success with no items when there is no file; kCredentialStoreDamaged, kCredentialStoreUnsafe,
    //             kCredentialReadFailed
    platform::CredentialOutcome load(PropertyList::Array& items, std::string* complaint = nullptr);

    // When the loaded file was last changed, in seconds since 1970; 0 when there was none.
    std::int64_t changed() const { return _changed; }

    // Replaces the items, all or nothing; without any, the file goes. Only after lock().
    //  result  kCredentialWriteFailed
    platform::CredentialOutcome save(PropertyList::Array items) const;

  private:
    // The failure of something that was about a file in the folder, or the folder itself.
    //  error  the system's error number; 0: none
    platform::CredentialOutcome _failure(platform::CredentialStatus status, const char* name,
                                         int error = 0) const;

    std::string _path;
    posix::FileDescriptor _folder;
    posix::FileLock _lock;
    std::int64_t _changed = 0;
};

// Whether the file of the folder at a path is certainly absent: a single system call where the root is "/".
// Any thread.
bool credentialFileIsAbsent(const posix::RootFolder& root, const std::string& folderPath);

} // namespace welcomer::local
