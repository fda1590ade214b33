// Hashes of passwords, through crypt(3).

#pragma once

#include <optional>
#include <string>

namespace welcomer::local {

// Whether a password is the one that a hash was made from. The comparison takes the same time wherever they
// differ. Any thread.
bool passwordMatches(const std::string& password, const std::string& hash);

// A yescrypt hash of a password with a salt of its own, or none when the system cannot make one. Any thread.
std::optional<std::string> makePasswordHash(const std::string& password);

} // namespace welcomer::local
