// File systems that only this test process and its children see.

#pragma once

#include <string>

namespace welcomer {

// Gives this process mounts of its own; they go away with it. Throws std::system_error when it may not.
void enterMountNamespace();

// Mounts a file system in memory on a folder, of this size and empty.
void mountMemory(const std::string& folder, const std::string& size);

// Takes away what is mounted on a folder. Never throws.
void unmount(const std::string& folder) noexcept;

// Makes what is mounted on a folder read-only.
void makeReadOnly(const std::string& folder);

} // namespace welcomer
