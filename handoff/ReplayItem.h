// The replay item: what the setup application leaves in the user's credential store for the agent of the next
// login. At most one exists. WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup writes it.

#pragma once

#include "platform/CredentialStore.h"
#include "propertylist/PropertyList.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace welcomer {

// The item's look-up key. Its label is the user's cloud account name, its data the replay object as an XML
// property list.
inline constexpr char kReplayItemService[] = "Welcomer Nimbus Replay Data";
inline constexpr char kReplayItemAccount[] = "Welcomer";

// What the agent reads from the replay object: under the first key the server's response, with those of the
// delegates under platform::kDelegatesKey, and two arrays of strings.
inline constexpr char kReplayResponsesKey[] = "delegatesResponseDict";
inline constexpr char kReplayVidlinkAliasesKey[] = "vlAliases";
inline constexpr char kReplayChatterAliasesKey[] = "imAliases";

// What the readers below log of an item that cannot be found, with the credential store's status.
inline constexpr char kReplayItemNotFoundMessage[] = "Failed to find replay keychain item: %d";

// The status in such a line of a log; none in any other line. Any thread.
std::optional<std::int32_t> replayItemNotFoundStatus(std::string_view line);

// Reads the replay item.
//  replayObject  where to put the replay object, or null: then nothing is deserialised. Any property-list
//                format is accepted. Written as soon as it has been read, also when the account name then
//                cannot be.
//  accountName   where to put the cloud account name, or null: then it is not read. Written on success only.
//  result        whether everything that was asked for was read; else one log line says why
// May block while another process changes the credential store.
bool WLGetNimbusReplayKeychainItem(PropertyList* replayObject, std::string* accountName);

// The replay item with all that there is to say of it.
struct ReplayItem {
    PropertyList replayObject;
    platform::CredentialItem item;                                // its label is the cloud account name
    std::unique_ptr<platform::CredentialItemReference> reference; // never null in one that was read
};

// Reads all of it at once.
//  found   written on success only
//  result  as of the reader above
// Any thread; may block while another process changes the credential store.
bool WLGetNimbusReplayKeychainItem(ReplayItem& found);

// The same.
//  status  of finding it; success also where it was found and could not be read
bool WLGetNimbusReplayKeychainItem(ReplayItem& found, std::int32_t& status);

// Deletes the replay item.
//  result  whether it was there and is gone now; else one log line with the credential store's status
// May block while another process changes the credential store.
bool WLDeleteNimbusReplayKeychainItem();

// The same.
//  status  the credential store's
bool WLDeleteNimbusReplayKeychainItem(std::int32_t& status);

// Deletes the one that has been read, without looking for it once more.
//  result  as above
// The agent calls this on its main thread.
bool WLDeleteNimbusReplayKeychainItem(const ReplayItem& read);

} // namespace welcomer
