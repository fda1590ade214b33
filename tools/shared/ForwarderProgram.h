// The forwarder of resolver overrides: what the service starts, and what is looked for where it is missing.

#pragma once

namespace welcomer::resolver {

inline constexpr const char* kForwarderProgram = "/usr/sbin/dnsmasq";

} // namespace welcomer::resolver
