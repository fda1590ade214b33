// The folder and the file that a local credential store consists of.

#pragma once

#include "backends/posix/FileDescriptor.h"
#include "backends/posix/FileLock.h"
#include "backends/posix/RootFolder.h"
#include "propertylist/PropertyList.h"

#include <cstdint>
#include <string>

namespace welcomer::local {

// Results are platform::CredentialStatus. One thread at a time.
class CredentialFolder {
  public:
    // Opens the folder.
    //  result  kCredentialItemNotFound when there is no folder, kCredentialStoreUnsafe, kCredentialReadFailed
    std::int32_t open(const posix::RootFolder& root, const std::string& path);

    // Waits for the other writers to finish and keeps them out until this object is gone; clears away what a
    // killed one left.
    //  path    of the lock file
    //  result  kCredentialStoreInUse when they do not let go of it, kCredentialWriteFailed
    std::int32_t lock(const posix::RootFolder& root, const std::string& path);

    // Reads the items. Each is a dictionary that itemMatches() and the rest of CredentialItemFormat.h
    // understand.
    //  result  success with no items when there is no file; kCredentialStoreDamaged, kCredentialStoreUnsafe,
    //          kCredentialReadFailed
    std::int32_t load(PropertyList::Array& items);

    // When the loaded file was last changed, in seconds since 1970; 0 when there was none.
    std::int64_t changed() const { return _changed; }

    // Replaces the items, all or nothing; without any, the file goes. Only after lock().
    //  result  kCredentialWriteFailed
    std::int32_t save(PropertyList::Array items) const;

  private:
    posix::FileDescriptor _folder;
    posix::FileLock _lock;
    std::int64_t _changed = 0;
};

// Whether the file of the folder at a path is certainly absent: a single system call where the root is "/".
// Any thread.
bool credentialFileIsAbsent(const posix::RootFolder& root, const std::string& folderPath);

} // namespace welcomer::local
