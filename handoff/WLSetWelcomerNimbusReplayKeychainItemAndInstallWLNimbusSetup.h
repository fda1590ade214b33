// The setup application's side of the hand-off.

#pragma once

#include "platform/CredentialStore.h"
#include "platform/ResourceBundle.h"
#include "propertylist/PropertyList.h"

#include <string>

namespace welcomer {

// Stores the replay item (handoff/ReplayItem.h) and installs the launch agent that has the agent run at the
// user's next login.
//  accountName   the user's cloud account name, UTF-8
//  replayObject  stored whatever it is; what cannot be written as a property list is stored as no data at all
//  bundle        the setup application's bundle, with the resources "wlnimbussetup" and
//                "com.corvid.welcomer.nimbussetup.user.plist"
//  result        true only when the item was stored and the launch-agent file was copied; else one log line
//                says why. An item or a file that is there already is not replaced. An item that was stored
//                stays, whatever follows.
// For the user whom the process runs as, on any thread; blocks for as long as the disk takes.
bool WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup(const std::string& accountName,
                                                                  const PropertyList& replayObject,
                                                                  platform::ResourceBundle& bundle);

// The same.
//  stored  what came of storing the item, with the reason for people that the log line has no place for
bool WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup(const std::string& accountName,
                                                                  const PropertyList& replayObject,
                                                                  platform::ResourceBundle& bundle,
                                                                  platform::CredentialOutcome& stored);

} // namespace welcomer
