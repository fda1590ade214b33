// A network that only this test process and its children see.

#pragma once

#include <string>

namespace welcomer {

// Whether this process may have a network of its own. Elsewhere than in CI, which runs as root, a test that
// needs one skips.
bool mayHaveNetwork();

// Gives this process an empty network of its own, with the loopback up; it goes away with the process. Throws
// std::system_error when it may not. Only while the process has one thread.
void enterNetworkNamespace();

// Runs a shell command and throws when it fails; what it prints is the result.
std::string shell(const std::string& command);

} // namespace welcomer
