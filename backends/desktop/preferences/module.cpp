#include "backends/desktop/ModuleEntry.h"
#include "backends/desktop/glib/Pointers.h"
#include "backends/desktop/preferences/DesktopPreferenceStore.h"

namespace welcomer::desktop {

namespace {

constexpr char kSchema[] = "org.gnome.desktop.screensaver";
constexpr char kKey[] = "lock-enabled";

std::optional<bool> screenAsksForPassword() noexcept {
    // Asking for a schema or a key that is not there would end the process.
    GSettingsSchemaSource* const source = g_settings_schema_source_get_default();
    const std::unique_ptr<GSettingsSchema, GLibDelete<g_settings_schema_unref>> schema(
        source ? g_settings_schema_source_lookup(source, kSchema, TRUE) : nullptr);
    if (!schema || g_settings_schema_has_key(schema.get(), kKey) == FALSE) {
        return std::nullopt;
    }
    const ObjectPointer<GSettings> settings(g_settings_new_full(schema.get(), nullptr, nullptr));
    const VariantPointer value(g_settings_get_value(settings.get(), kKey));
    return g_variant_is_of_type(value.get(), G_VARIANT_TYPE_BOOLEAN) != FALSE
               ? std::optional(g_variant_get_boolean(value.get()) != FALSE)
               : std::nullopt;
}

std::unique_ptr<ScreenLockModule::Interface>
createScreenLock(ScreenLockModule::Interface* /*local*/, const ScreenLockModule::Arguments& /*arguments*/,
                 std::string& /*whyNot*/) {
    return std::make_unique<ScreenLockModule::Interface>(screenAsksForPassword);
}

bool describeScreenLock(const ScreenLockModule::Arguments& /*arguments*/, platform::BackendReport& report) {
    const std::optional<bool> asks = screenAsksForPassword();
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
