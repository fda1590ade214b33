// An item as the Secret Service keeps it.

#pragma once

#include "backends/desktop/glib/Pointers.h"
#include "platform/CredentialStore.h"

#include <string>

namespace welcomer::desktop {

inline constexpr char kItemInterface[] = "org.freedesktop.Secret.Item";

// The attributes that an item is found by, of the type a{ss}; a floating reference. Any thread, all of them.
GVariant* searchAttributes(const std::string& service, const std::string& account);

// The properties of an item that is to be made, of the type a{sv}; a floating reference.
GVariant* itemProperties(const platform::CredentialItem& item);

// What an item's properties, of the type a{sv}, say.
platform::CredentialItem itemFrom(GVariant* properties);

} // namespace welcomer::desktop
