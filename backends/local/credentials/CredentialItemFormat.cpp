#include "backends/local/credentials/CredentialItemFormat.h"

#include "propertylist/UTF8.h"

#include <algorithm>
#include <string_view>
#include <utility>

namespace welcomer::local {

namespace {

constexpr char kServiceKey[] = "Service";
constexpr char kAccountKey[] = "Account";
constexpr char kLabelKey[] = "Label";
constexpr char kDataKey[] = "Data";
constexpr char kAccessKey[] = "Access";
constexpr char kDescriptionKey[] = "Description";
constexpr char kTrustedApplicationsKey[] = "TrustedApplications";

PropertyList fromText(const std::string& text) {
    if (findInvalidXMLText(text) == std::string::npos) {
        return {text};
    }
    return PropertyList::Data{text};
}

// The text of a value, or null when it holds none. Borrowed.
const std::string* textOf(const PropertyList* value) {
    if (!value) {
        return nullptr;
    }
    const PropertyList::Data* data = value->data();
    return data ? &data->bytes : value->string();
}

bool isText(const PropertyList& value) {
    return textOf(&value) != nullptr;
}

bool isAccess(const PropertyList& value) {
    const PropertyList* applications = value.find(kTrustedApplicationsKey);
    const PropertyList::Array* paths = applications ? applications->array() : nullptr;
    return paths && textOf(value.find(kDescriptionKey)) && std::all_of(paths->begin(), paths->end(), isText);
}

PropertyList fromAccess(const platform::CredentialAccess& access) {
    PropertyList::Array paths;
    for (const platform::TrustedApplication& application : access.trustedApplications) {
        paths.push_back(fromText(application.path));
    }
    PropertyList::Dictionary result;
    result[kDescriptionKey] = fromText(access.description);
    result[kTrustedApplicationsKey] = std::move(paths);
    return result;
}

platform::CredentialAccess toAccess(const PropertyList& value) {
    platform::CredentialAccess access{*textOf(value.find(kDescriptionKey)), {}};
    for (const PropertyList& path : *value.find(kTrustedApplicationsKey)->array()) {
        access.trustedApplications.push_back({*textOf(&path)});
    }
    return access;
}

} // namespace

bool isCredentialItem(const PropertyList& value) {
    const PropertyList* data = value.find(kDataKey);
    const PropertyList* access = value.find(kAccessKey);
    return textOf(value.find(kServiceKey)) && textOf(value.find(kAccountKey)) &&
           textOf(value.find(kLabelKey)) && data && data->data() && (!access || isAccess(*access));
}

PropertyList makeCredentialItem(const platform::CredentialItem& attributes, const std::string& data) {
    PropertyList::Dictionary item;
    item[kServiceKey] = fromText(attributes.service);
    item[kAccountKey] = fromText(attributes.account);
    item[kLabelKey] = fromText(attributes.label);
    item[kDataKey] = PropertyList::Data{data};
    if (attributes.access) {
        item[kAccessKey] = fromAccess(*attributes.access);
    }
    return item;
}

bool credentialItemHasKey(const PropertyList& item, const std::string& service, const std::string& account) {
    return *textOf(item.find(kServiceKey)) == service && *textOf(item.find(kAccountKey)) == account;
}

platform::CredentialItem credentialItemAttributes(const PropertyList& item) {
    platform::CredentialItem attributes{*textOf(item.find(kServiceKey)), *textOf(item.find(kAccountKey)),
                                        *textOf(item.find(kLabelKey)), std::nullopt};
    if (const PropertyList* access = item.find(kAccessKey)) {
        attributes.access = toAccess(*access);
    }
    return attributes;
}

std::string takeCredentialItemData(PropertyList& item) {
    return std::move(item.dictionary()->at(kDataKey).data()->bytes);
}

} // namespace welcomer::local
