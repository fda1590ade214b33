#include "platform/PreferenceStore.h"

#include "propertylist/PropertyListReadings.h"

namespace welcomer::platform {

std::vector<std::optional<PropertyList>> PreferenceStore::copyValues(std::span<const std::string> keys,
                                                                     const std::string& domain) {
    std::vector<std::optional<PropertyList>> values;
    for (const std::string& key : keys) {
        values.push_back(copyValue(key, domain));
    }
    return values;
}

bool PreferenceStore::booleanDefault(const std::string& key) {
    return booleanReading(copyValue(key, kStandardDefaultsDomain));
}

std::int64_t PreferenceStore::integerDefault(const std::string& key) {
    return integerReading(copyValue(key, kStandardDefaultsDomain));
}

} // namespace welcomer::platform
