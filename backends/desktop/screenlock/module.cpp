#include "backends/desktop/ModuleEntry.h"
#include "backends/desktop/ScreenLockModule.h"
#include "backends/desktop/glib/Pointers.h"

namespace welcomer::desktop {

namespace {

constexpr char kSchema[] = "org.gnome.desktop.screensaver";
constexpr char kKey[] = "lock-enabled";

class GSettingsScreenLock final : public ScreenLock {
  public:
    std::optional<bool> asksForPassword() noexcept override {
        // Asking for a schema or a key that is not there would end the process.
        GSettingsSchemaSource* const source = g_settings_schema_source_get_default();
        GSettingsSchema* const schema =
            source ? g_settings_schema_source_lookup(source, kSchema, TRUE) : nullptr;
        if (!schema) {
            return std::nullopt;
        }
        std::optional<bool> result;
        if (g_settings_schema_has_key(schema, kKey)) {
            const ObjectPointer<GSettings> settings(g_settings_new_full(schema, nullptr, nullptr));
            const VariantPointer value(g_settings_get_value(settings.get(), kKey));
            if (g_variant_is_of_type(value.get(), G_VARIANT_TYPE_BOOLEAN)) {
                result = g_variant_get_boolean(value.get()) != FALSE;
            }
        }
        g_settings_schema_unref(schema);
        return result;
    }
};

std::unique_ptr<ScreenLock> createScreenLock(const ScreenLockModule::Arguments& /*arguments*/,
                                             std::string& /*whyNot*/) {
    return std::make_unique<GSettingsScreenLock>();
}

bool describeScreenLock(const ScreenLockModule::Arguments& /*arguments*/, platform::BackendReport& report) {
    const std::optional<bool> asks = GSettingsScreenLock().asksForPassword();
    if (!asks) {
        report.reason = "the schema " + std::string(kSchema) + " is not installed";
        report.advice = "install gsettings-desktop-schemas, for a desktop that heeds them";
        return false;
    }
    report.backend = "files, and the desktop's setting of the screen lock";
    report.reason = std::string(kKey) + " is " + (*asks ? "on" : "off");
    return true;
}

} // namespace

} // namespace welcomer::desktop

WELCOMER_DESKTOP_MODULE(welcomer::desktop::ScreenLockModule, welcomer::desktop::createScreenLock,
                        welcomer::desktop::describeScreenLock)
