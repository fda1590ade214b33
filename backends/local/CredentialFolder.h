// The folder and the file that a local credential store consists of.

#pragma once

#include "backends/local/FileDescriptor.h"
#include "propertylist/PropertyList.h"

#include <cstdint>
#include <string>

namespace welcomer::local {

// Results are platform::CredentialStatus. One thread at a time.
class CredentialFolder {
  public:
    // Opens the folder, a path of this machine.
    //  result  kCredentialItemNotFound when there is no folder, kCredentialStoreUnsafe, kCredentialReadFailed
    std::int32_t open(const std::string& path);

    // Waits for the other writers to finish and keeps them out until this object is gone; clears away what a
    // killed one left.
    std::int32_t lock();

    // Reads the items. Each is a dictionary that itemMatches() and the rest of CredentialItemFormat.h
    // understand.
    //  result  success with no items when there is no file; kCredentialStoreDamaged, kCredentialStoreUnsafe,
    //          kCredentialReadFailed
    std::int32_t load(PropertyList::Array& items) const;

    // Replaces the items, all or nothing; without any, the file goes. Only after lock().
    //  result  kCredentialWriteFailed
    std::int32_t save(PropertyList::Array items) const;

  private:
    FileDescriptor _folder;
};

// Whether the file of the folder at a path is certainly absent: a single system call. Any thread.
bool credentialFileIsAbsent(const std::string& folderPath);

} // namespace welcomer::local
