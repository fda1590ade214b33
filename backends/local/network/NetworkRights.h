// Who may change the network.

#pragma once

namespace welcomer::local {

// Whether this process has the right to change the network. Any thread.
bool mayChangeNetwork();

} // namespace welcomer::local
