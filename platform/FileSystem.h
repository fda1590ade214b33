// Files and folders. Every path is absolute and looked up below the platform's root folder.

#pragma once

#include "platform/Error.h"

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::platform {

// The longest file that counts as text, in bytes.
inline constexpr std::size_t kMaximumTextSize = std::size_t{1024} * 1024;

// Any thread.
class FileSystem {
  public:
    virtual ~FileSystem() = default;

    // Whether something exists at the path, a dangling symbolic link not counted.
    virtual bool exists(const std::string& path) = 0;

    // Removes a file, a symbolic link (never what it points to) or a folder with all that is in it.
    virtual Outcome remove(const std::string& path) = 0;

    // Creates one folder, not its parents. Fails with EEXIST when anything is at the path.
    //  mode  its permissions, whatever the process's mask
    virtual Outcome createDirectory(const std::string& path, std::uint32_t mode) = 0;

    // Copies a file's content and permissions. Fails with EEXIST when anything is at the destination, which
    // is then untouched; on any failure nothing of the copy is left behind.
    virtual Outcome copy(const std::string& source, const std::string& destination) = 0;

    // The names of a folder's entries without "." and "..", in the file system's own order, or none when the
    // folder is missing or unreadable.
    virtual std::optional<std::vector<std::string>> list(const std::string& path) = 0;

    // A file's content, or none when it is missing or unreadable, no regular file, longer than
    // kMaximumTextSize or not UTF-8. Never blocks on what is no regular file.
    virtual std::optional<std::string> readText(const std::string& path) = 0;

    // Puts a text in place of a file's content, not atomically: when that fails, the file may hold a part of
    // the text. A file that is missing is created with mode 0644, whatever the process's mask; one that is
    // there keeps its permissions.
    virtual Outcome writeText(const std::string& path, const std::string& text) = 0;
};

} // namespace welcomer::platform
