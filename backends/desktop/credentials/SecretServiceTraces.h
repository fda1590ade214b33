// Whether there is a Secret Service where none can be asked.

#pragma once

#include "backends/posix/RootFolder.h"
#include "platform/ProcessIdentity.h"

namespace welcomer::desktop {

// The local store stands in for the Secret Service only where there is none at all. That is so
//  - where this program has no module for it, or cannot load it;
//  - where a session bus answers that nobody has the service's name and that it could start nobody for it;
//  - where no session bus answers, and there is no trace of one: no "org.freedesktop.secrets.service" that a
//    session bus would start it by (in "dbus-1/services" below /usr/share, /usr/local/share and the user's
//    ~/.local/share), and no keyring of the user's own (in ~/.local/share/keyrings or
//    ~/.local/share/kwalletd).
// Everywhere else an item that is not in the local store may be in the keyring.

// The last of the three: whether there is a trace.
//  root  the folder below which everything is looked up
// Any thread.
bool hasSecretServiceTraces(const posix::RootFolder& root, platform::ProcessIdentity& identity);

} // namespace welcomer::desktop
