// File systems that only this test process and its children see.

#pragma once

#include <string>

namespace welcomer {

// Whether this process may have mounts of its own. Elsewhere than in CI, which runs as root, a test that
// needs them skips.
bool mayMount();

// Gives this process mounts of its own; they go away with it. Throws std::system_error when it may not. Only
// while the process has one thread.
void enterMountNamespace();

// Mounts a file system in memory on a folder, of this size ("64k") and empty, for its owner alone.
void mountMemory(const std::string& folder, const std::string& size);

// Makes what is mounted on a folder read-only, or writable again.
void makeReadOnly(const std::string& folder, bool readOnly = true);

// Makes a file a mount point of its own.
void mountOnItself(const std::string& file);

// Takes away what is mounted on a folder. Never throws.
void unmount(const std::string& folder) noexcept;

} // namespace welcomer
