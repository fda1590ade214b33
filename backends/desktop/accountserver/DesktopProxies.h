// Which proxies the desktop wants for a server.

#pragma once

#include "backends/desktop/accountserver/Interruption.h"

#include <chrono>
#include <string>
#include <vector>

namespace welcomer::desktop {

// Asks GLib, which knows the desktop's settings and, with glib-networking, the environment of other sessions. One
// that configures itself may be fetched from the network for it.
//  address  of the server: "https://HOST..."
//  limit    how long that may take
//  result   in the order in which they are to be tried, as libcurl takes them; "" is none. Empty where nobody
//           has anything to say
// Any thread; blocks.
std::vector<std::string> desktopProxies(const std::string& address, std::chrono::milliseconds limit,
                                        Interruption& interruption);

} // namespace welcomer::desktop
