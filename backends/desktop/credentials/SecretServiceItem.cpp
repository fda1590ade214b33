#include "backends/desktop/credentials/SecretServiceItem.h"

#include "backends/desktop/credentials/AttributeText.h"

#include <map>

namespace welcomer::desktop {

namespace {

using platform::CredentialItem;

constexpr char kSchema[] = "com.corvid.welcomer.Credential";
constexpr char kSchemaKey[] = "xdg:schema";
constexpr char kServiceKey[] = "service";
constexpr char kAccountKey[] = "account";
constexpr char kLabelKey[] = "label"; // only of a label that is no text
constexpr char kAccessKey[] = "access";
constexpr char kTrustedApplicationKey[] = "trusted-application-"; // and its number, from 1 on

std::map<std::string, std::string> allAttributes(const CredentialItem& item) {
    std::map<std::string, std::string> attributes = {
        {kServiceKey, item.service}, {kAccountKey, item.account}, {kSchemaKey, kSchema}};
    if (attributeText(item.label) != item.label) {
        attributes[kLabelKey] = item.label;
    }
    if (item.access) {
        attributes[kAccessKey] = item.access->description;
        int number = 0;
        for (const platform::TrustedApplication& application : item.access->trustedApplications) {
            attributes[kTrustedApplicationKey + std::to_string(++number)] = application.path;
        }
    }
    return attributes;
}

CredentialItem itemFrom(const std::string& label, const std::map<std::string, std::string>& attributes) {
    const auto bytes = [&](const std::string& key) {
        const auto found = attributes.find(key);
        return found == attributes.end() ? std::string() : bytesOfAttribute(found->second);
    };
    CredentialItem item{bytes(kServiceKey), bytes(kAccountKey), label, std::nullopt};
    if (attributes.contains(kLabelKey)) {
        item.label = bytes(kLabelKey);
    }
    if (attributes.contains(kAccessKey)) {
        item.access = platform::CredentialAccess{bytes(kAccessKey), {}};
        for (int number = 1; attributes.contains(kTrustedApplicationKey + std::to_string(number)); ++number) {
            item.access->trustedApplications.push_back(
                {bytes(kTrustedApplicationKey + std::to_string(number))});
        }
    }
    return item;
}

void addProperty(GVariantBuilder& properties, const char* name, GVariant* value) {
    const TextPointer full(g_strconcat(kItemInterface, ".", name, nullptr));
    g_variant_builder_add(&properties, "{sv}", full.get(), value);
}

} // namespace

GVariant* searchAttributes(const std::string& service, const std::string& account) {
    GVariantBuilder attributes;
    g_variant_builder_init(&attributes, G_VARIANT_TYPE("a{ss}"));
    g_variant_builder_add(&attributes, "{ss}", kServiceKey, attributeText(service).c_str());
    g_variant_builder_add(&attributes, "{ss}", kAccountKey, attributeText(account).c_str());
    return g_variant_builder_end(&attributes);
}

GVariant* itemProperties(const CredentialItem& item) {
    GVariantBuilder attributes;
    g_variant_builder_init(&attributes, G_VARIANT_TYPE("a{ss}"));
    for (const auto& [key, bytes] : allAttributes(item)) {
        g_variant_builder_add(&attributes, "{ss}", key.c_str(), attributeText(bytes).c_str());
    }
    GVariantBuilder properties;
    g_variant_builder_init(&properties, G_VARIANT_TYPE_VARDICT);
    addProperty(properties, "Attributes", g_variant_builder_end(&attributes));
    addProperty(properties, "Label", g_variant_new_string(attributeText(item.label).c_str()));
    return g_variant_builder_end(&properties);
}

CredentialItem itemFrom(GVariant* properties) {
    std::string label;
    const char* text = nullptr;
    if (g_variant_lookup(properties, "Label", "&s", &text)) {
        label = text;
    }
    std::map<std::string, std::string> attributes;
    GVariantIter* iterator = nullptr;
    if (g_variant_lookup(properties, "Attributes", "a{ss}", &iterator)) {
        const char* key = nullptr;
        const char* value = nullptr;
        while (g_variant_iter_next(iterator, "{&s&s}", &key, &value)) {
            attributes[key] = value;
        }
        g_variant_iter_free(iterator);
    }
    CredentialItem item = itemFrom(label, attributes);
    guint64 modified = 0;
    if (g_variant_lookup(properties, "Modified", "t", &modified)) {
        item.changed = static_cast<std::int64_t>(modified);
    }
    return item;
}

} // namespace welcomer::desktop
