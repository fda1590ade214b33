// A library's file before it is loaded.

#pragma once

#include "backends/posix/RootFolder.h"

#include <string>

namespace welcomer::local {

// Why the file at a path must not be given to the loader, which trusts what it maps: others may change it or its folder,
// it is no regular file, or it is shorter than it says itself or being changed, as while it is copied to its place. What
// is no library at all is left to the loader to tell.
//  path    absolute, below the root; links are followed
//  result  one line; empty when nothing speaks against it
// Never blocks, whatever lies at the path. Any thread.
std::string reasonNotToLoad(const posix::RootFolder& root, const std::string& path);

} // namespace welcomer::local
