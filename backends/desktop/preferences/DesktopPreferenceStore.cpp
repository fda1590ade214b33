#include "backends/desktop/preferences/DesktopPreferenceStore.h"

namespace welcomer::desktop {

namespace {

constexpr char kScreenSaverDomain[] = "com.corvid.screensaver";

} // namespace

std::optional<PropertyList> DesktopPreferenceStore::copyValue(const std::string& key,
                                                              const std::string& domain) {
    if (key == "askForPassword" && domain == kScreenSaverDomain) {
        if (const std::optional<bool> asks = (*_module.service())()) {
            return PropertyList(*asks);
        }
    }
    return _local.copyValue(key, domain);
}

std::vector<std::optional<PropertyList>> DesktopPreferenceStore::copyValues(std::span<const std::string> keys,
                                                                            const std::string& domain) {
    return domain == kScreenSaverDomain ? PreferenceStore::copyValues(keys, domain)
                                        : _local.copyValues(keys, domain);
}

void DesktopPreferenceStore::setValue(const std::string& key, const PropertyList& value,
                                      const std::string& domain) {
    _local.setValue(key, value, domain);
}

void DesktopPreferenceStore::removeValue(const std::string& key, const std::string& domain) {
    _local.removeValue(key, domain);
}

bool DesktopPreferenceStore::synchronise(const std::string& domain) {
    return _local.synchronise(domain);
}

std::vector<platform::DamagedPreferences> DesktopPreferenceStore::damagedPreferences() {
    return _local.damagedPreferences();
}

platform::BackendReport DesktopPreferenceStore::report() {
    platform::BackendReport report{"PreferenceStore", "files", "", ""};
    _module.describe(report);
    return report;
}

} // namespace welcomer::desktop
