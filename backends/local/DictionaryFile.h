// Files that hold a dictionary each: a preference domain, the accounts, the network configuration.

#pragma once

#include "backends/posix/FileDescriptor.h"
#include "backends/posix/FileLock.h"
#include "backends/posix/RootFolder.h"
#include "platform/Error.h"
#include "propertylist/PropertyList.h"

#include <optional>
#include <string>
#include <sys/types.h>

namespace welcomer::local {

// What was found in a file's place.
struct DictionaryFileContent {
    enum class State {
        Whole,      // a dictionary; an empty one where there is no file or an empty file
        Damaged,    // no property list, or one that is no dictionary
        Unreadable, // the system refused to read it, or it is too long to be one
    };
    State state = State::Whole;
    PropertyList::Dictionary values; // empty unless whole
    std::string bytes;               // the file's own, unless unreadable
    std::string reason;              // one line, unless whole
    std::string otherBytes{};        // of no meaning; the memory for the next reading
};

// Reads a file, in any property-list format, without a lock. Any thread.
DictionaryFileContent readDictionaryFile(const posix::RootFolder& root, const std::string& path);

// The same, where it was read before: bytes that did not change are not parsed again. Any thread.
//  content  what was there before, replaced by what is there now
void rereadDictionaryFile(const posix::RootFolder& root, const std::string& path,
                          DictionaryFileContent& content);

// A folder of such files, with the lock of all of them held for as long as this lives. One thread at a time.
class LockedDictionaryFolder {
  public:
    // Opens the folder, making it where it is missing, and waits for the other writers.
    //  lockPath              of the lock file (FileLock.h)
    //  folderMode, fileMode  the permissions of a new folder and of its new files; the user's alone unless
    //                        given
    LockedDictionaryFolder(const posix::RootFolder& root, const std::string& path,
                           const std::string& lockPath, mode_t folderMode = 0700, mode_t fileMode = 0600);

    // Whether all of that succeeded; without it nothing below but `error` may be called.
    explicit operator bool() const { return static_cast<bool>(_lock); }

    // What failed last, with the path and the reason, in one line.
    const platform::Error& error() const { return _error; }

    // Replaces a file's content, all or nothing. The file keeps its permissions.
    //  result  the file's new bytes, none when the values cannot be written
    std::optional<std::string> write(const std::string& name, const PropertyList::Dictionary& values);

    // Gives a damaged file another name, one that is free. A mount point keeps its name and its content is
    // moved.
    //  bytes   its content
    //  result  the other name, empty when that failed; the file is then unchanged
    std::string setAside(const std::string& name, const std::string& bytes);

  private:
    bool _moveContent(const std::string& name, int destination, const std::string& bytes) const;

    std::string _shown(const std::string& name) const;

    const std::string _shownPath; // of the folder
    const mode_t _fileMode;
    posix::FileDescriptor _folder;
    posix::FileLock _lock;
    platform::Error _error;
};

} // namespace welcomer::local
