// Reading and writing all of an open file.

#pragma once

#include "backends/posix/RootFolder.h"

#include <cstddef>
#include <limits>
#include <string>
#include <string_view>

namespace welcomer::posix {

// Reads from the file's current position to its end.
//  content  receives what was read; unspecified on failure
//  maximum  the number of bytes beyond which the call fails with EFBIG
//  result   0, or the system's error number
// Any thread.
int readAll(int descriptor, std::string& content,
            std::size_t maximum = std::numeric_limits<std::size_t>::max());

// Opens a file and reads it in the same way; what is no regular file fails with EINVAL, without blocking.
int readFile(const RootFolder& root, const std::string& path, std::string& content,
             std::size_t maximum = std::numeric_limits<std::size_t>::max());

// Writes at the file's current position.
//  result  0, or the system's error number; a part may have been written then
// Any thread.
int writeAll(int descriptor, std::string_view content);

} // namespace welcomer::posix
