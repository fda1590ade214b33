// Preferences as the local store has them, but for the one that the desktop has a setting of its own for.

#pragma once

#include "backends/desktop/DesktopModule.h"
#include "backends/desktop/ScreenLockModule.h"
#include "platform/PreferenceStore.h"

namespace welcomer::desktop {

// "askForPassword" of "com.corvid.screensaver" reads as the desktop's "lock-enabled" where that schema is
// installed, and as stored elsewhere. Writing it changes what is stored, never the desktop's setting. The
// module is loaded when that key is first read.
class DesktopPreferenceStore final : public platform::PreferenceStore {
  public:
    //  local  borrowed
    explicit DesktopPreferenceStore(platform::PreferenceStore& local) : _local(local) {}

    std::optional<PropertyList> copyValue(const std::string& key, const std::string& domain) override;
    std::vector<std::optional<PropertyList>> copyValues(std::span<const std::string> keys,
                                                        const std::string& domain) override;
    void setValue(const std::string& key, const PropertyList& value, const std::string& domain) override;
    void removeValue(const std::string& key, const std::string& domain) override;
    bool synchronise(const std::string& domain) override;
    std::vector<platform::DamagedPreferences> damagedPreferences() override;

    // Any thread; loads the module.
    platform::BackendReport report();

  private:
    platform::PreferenceStore& _local;
    DesktopModule<ScreenLockModule> _module{{}};
};

} // namespace welcomer::desktop
