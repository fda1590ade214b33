// How an item is kept in the property list of a local credential store.

#pragma once

#include "platform/CredentialStore.h"
#include "propertylist/PropertyList.h"

#include <string>

namespace welcomer::local {

// Whether a value is an item. The functions below take nothing else. Any thread, all of them.
bool isCredentialItem(const PropertyList& value);

// Makes an item out of its attributes and its secret. Text that XML has no place for is kept as data.
PropertyList makeCredentialItem(const platform::CredentialItem& attributes, const std::string& data);

// Whether an item is the one with this service and account.
bool credentialItemHasKey(const PropertyList& item, const std::string& service, const std::string& account);

// The attributes of an item, and its secret, which is moved out of it.
platform::CredentialItem credentialItemAttributes(const PropertyList& item);
std::string takeCredentialItemData(PropertyList& item);

} // namespace welcomer::local
