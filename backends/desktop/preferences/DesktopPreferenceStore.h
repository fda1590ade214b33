// Preferences as the local store has them, but for the one that the desktop has a setting of its own for.

#pragma once

#include "backends/desktop/DesktopModule.h"
#include "platform/PreferenceStore.h"

#include <functional>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace welcomer::desktop {

// The desktop's setting of the screen lock, as a module.
struct ScreenLockModule {
    static constexpr char kName[] = "screenlock";
    // Whether the screen asks for the password once it is locked: "lock-enabled" of
    // org.gnome.desktop.screensaver; none where that schema is not installed. Any thread; never throws.
    using Interface = std::function<std::optional<bool>()>;
    struct Arguments {};
};

// "askForPassword" of "com.corvid.screensaver" reads as the desktop's "lock-enabled" where that schema is
// installed, and as stored elsewhere. Writing it changes what is stored, never the desktop's setting. The
// module is loaded when that key is first read.
class DesktopPreferenceStore final : public platform::PreferenceStore {
  public:
    //  local  borrowed
    explicit DesktopPreferenceStore(platform::PreferenceStore& local, Modules modules = {})
        : _local(local),
          _module(&_notInstalled, {}, std::move(modules)) {}

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
    // Without it what is stored is the answer.
    ScreenLockModule::Interface _notInstalled = [] {
        return std::nullopt;
    };
    DesktopModule<ScreenLockModule> _module;
};

} // namespace welcomer::desktop
