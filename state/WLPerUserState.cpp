#include "state/WLPerUserState.h"

#include "log/PCLogManager.h"
#include "platform/Platform.h"
#include "propertylist/Lookup.h"
#include "propertylist/PropertyListReadings.h"

#include <cstddef>
#include <functional>
#include <string_view>
#include <utility>

namespace welcomer {

namespace {

constexpr char kPreviousSystemVersionProperty[] = "previousSystemVersion";
constexpr char kIsNewUserAccountProperty[] = "isNewUserAccount";

constexpr std::size_t kComparedComponents = 3;

// The store's own form of the domain's name.
const std::string& domain() {
    static const auto* const name = new std::string(kPerUserStateDomain);
    return *name;
}

std::optional<PropertyList> asValue(std::optional<std::string> text) {
    return text ? std::optional<PropertyList>(std::move(*text)) : std::nullopt;
}

std::optional<std::string> asText(std::optional<PropertyList> value) {
    std::string* text = value ? value->string() : nullptr;
    return text ? std::optional(std::move(*text)) : std::nullopt;
}

WLPerUserState::VersionComponents componentsOf(std::string_view version) {
    WLPerUserState::VersionComponents components;
    while (true) {
        const std::size_t point = version.find('.');
        components.push_back(std::make_shared<const std::string>(version.substr(0, point)));
        if (point == std::string_view::npos) {
            return components;
        }
        version.remove_prefix(point + 1);
    }
}

} // namespace

WLPerUserState& WLPerUserState::currentPerUserState() {
    static auto* const state = new WLPerUserState;
    return *state;
}

WLPerUserState::WLPerUserState() {
    if (platform::current().processIdentity.effectiveUserID() != 0) {
        _loadFromDefaults();
    }
}

std::unique_ptr<WLPerUserState>
WLPerUserState::initWithDictionaryRepresentation(const PropertyList::Dictionary& dictionary) {
    auto state = std::make_unique<WLPerUserState>();
    for (const Entry& entry : _entries()) {
        const PropertyList* const found = valueIn(dictionary, entry.key);
        if (!entry.isTakenFromDictionary || !found) {
            continue;
        }
        if (entry.text) {
            state->_setText(entry.text, *found);
        } else {
            (*state.*entry.flag).set(booleanReading(*found));
        }
    }
    return state;
}

WLPerUserState::~WLPerUserState() {
    setPreviousSystemVersion(std::nullopt);
    setPreviousBuildVersion(std::nullopt);
}

PropertyList::Dictionary WLPerUserState::dictionaryRepresentation() const {
    PropertyList::Dictionary dictionary;
    for (const Entry& entry : _entries()) {
        if (entry.text) {
            if (const auto value = (this->*entry.text).get()) {
                dictionary.emplace(entry.key, *value);
            }
        } else if ((this->*entry.flag).get()) {
            dictionary.emplace(entry.key, true);
        }
    }
    return dictionary;
}

std::optional<std::string> WLPerUserState::previousSystemVersion() const {
    return asText(_previousSystemVersion.get());
}
void WLPerUserState::setPreviousSystemVersion(const std::optional<std::string>& version) {
    _setText(&WLPerUserState::_previousSystemVersion, asValue(version));
}
std::optional<std::string> WLPerUserState::previousBuildVersion() const {
    return asText(_previousBuildVersion.get());
}
void WLPerUserState::setPreviousBuildVersion(const std::optional<std::string>& version) {
    _setText(&WLPerUserState::_previousBuildVersion, asValue(version));
}
void WLPerUserState::setPreviousSystemVersionBuildVersion(const std::optional<std::string>& systemVersion,
                                                          const std::optional<std::string>& buildVersion) {
    setPreviousSystemVersion(systemVersion);
    setPreviousBuildVersion(buildVersion);
}
bool WLPerUserState::didSeeCloudSetup() const {
    return _didSeeCloudSetup.get();
}
void WLPerUserState::setDidSeeCloudSetup(bool didSee) {
    _didSeeCloudSetup.set(didSee);
}
std::optional<std::string> WLPerUserState::lastSeenCloudProductVersion() const {
    return asText(_lastSeenCloudProductVersion.get());
}
void WLPerUserState::setLastSeenCloudProductVersion(const std::optional<std::string>& version) {
    _setText(&WLPerUserState::_lastSeenCloudProductVersion, asValue(version));
}
bool WLPerUserState::didSeeSyncSetup() const {
    return _didSeeSyncSetup.get();
}
void WLPerUserState::setDidSeeSyncSetup(bool didSee) {
    _didSeeSyncSetup.set(didSee);
}
bool WLPerUserState::didSeeSyncSetup2() const {
    return _didSeeSyncSetup2.get();
}
void WLPerUserState::setDidSeeSyncSetup2(bool didSee) {
    _didSeeSyncSetup2.set(didSee);
}
std::optional<std::string> WLPerUserState::lastSeenSyncProductVersion() const {
    return asText(_lastSeenSyncProductVersion.get());
}
void WLPerUserState::setLastSeenSyncProductVersion(const std::optional<std::string>& version) {
    _setText(&WLPerUserState::_lastSeenSyncProductVersion, asValue(version));
}
std::optional<std::string> WLPerUserState::lastPreLoginTasksPerformedBuild() const {
    return asText(_lastPreLoginTasksPerformedBuild.get());
}
void WLPerUserState::setLastPreLoginTasksPerformedBuild(const std::optional<std::string>& build) {
    _setText(&WLPerUserState::_lastPreLoginTasksPerformedBuild, asValue(build));
}
std::optional<std::string> WLPerUserState::lastPreLoginTasksPerformedVersion() const {
    return asText(_lastPreLoginTasksPerformedVersion.get());
}
void WLPerUserState::setLastPreLoginTasksPerformedVersion(const std::optional<std::string>& version) {
    _setText(&WLPerUserState::_lastPreLoginTasksPerformedVersion, asValue(version));
}
bool WLPerUserState::skipFirstLoginOptimization() const {
    return _skipFirstLoginOptimization.get();
}
void WLPerUserState::setSkipFirstLoginOptimization(bool skip) {
    _skipFirstLoginOptimization.set(skip);
}
std::optional<std::string> WLPerUserState::lastCacheCleanupProductVersion() const {
    return asText(_lastCacheCleanupProductVersion.get());
}
void WLPerUserState::setLastCacheCleanupProductVersion(const std::optional<std::string>& version) {
    _setText(&WLPerUserState::_lastCacheCleanupProductVersion, asValue(version));
}
bool WLPerUserState::lastCacheCleanupStillRunning() const {
    return _lastCacheCleanupStillRunning.get();
}
void WLPerUserState::setLastCacheCleanupStillRunning(bool isRunning) {
    _lastCacheCleanupStillRunning.set(isRunning);
}
bool WLPerUserState::runNonInteractive() const {
    return _runNonInteractive.get();
}
void WLPerUserState::setRunNonInteractive(bool runNonInteractive) {
    _runNonInteractive.set(runNonInteractive);
}
bool WLPerUserState::showKeychainSyncGreeterAtLogin() const {
    return _showKeychainSyncGreeterAtLogin.get();
}
void WLPerUserState::setShowKeychainSyncGreeterAtLogin(bool show) {
    _showKeychainSyncGreeterAtLogin.set(show);
}

bool WLPerUserState::isNewUserAccount() const {
    const std::string version = previousSystemVersion().value_or("");
    return version.empty() || version == "0" || version.starts_with("0.");
}

bool WLPerUserState::writeToDefaults() {
    for (const Entry& entry : _entries()) {
        if (entry.text) {
            _setStringForKey((this->*entry.text).get(), entry.key);
        } else {
            _setBoolForKey((this->*entry.flag).get(), entry.key);
        }
    }
    WL_LOG_AS("-[WLPerUserState writeToDefaults]", "Writing per-user state");
    return platform::current().preferenceStore.synchronise(domain());
}

void WLPerUserState::_loadFromDefaults() {
    static const auto* const keys = new std::vector<std::string>(_keys());
    platform::PreferenceStore& store = platform::current().preferenceStore;
    // A failure only means that others' changes may not be seen yet.
    static_cast<void>(store.synchronise(domain()));
    std::vector<std::optional<PropertyList>> values = store.copyValues(*keys, domain());
    auto stored = values.begin();
    for (const Entry& entry : _entries()) {
        if (entry.text) {
            _setText(entry.text, _stringForKey(std::move(*stored)));
        } else {
            (this->*entry.flag).set(_boolForKey(*stored));
        }
        ++stored;
    }
}

int WLPerUserState::_compareSystemVersionWith(const std::optional<std::string>& a,
                                              const std::optional<std::string>& b) {
    if (!a || !b) {
        return static_cast<int>(a.has_value()) - static_cast<int>(b.has_value());
    }
    return _compareComponentsWith(componentsOf(*a), componentsOf(*b));
}

int WLPerUserState::_compareComponentsWith(const VersionComponents& a, const VersionComponents& b) {
    const auto component = [](const VersionComponents& components, std::size_t index) {
        return index < components.size() ? components[index].get() : nullptr;
    };
    for (std::size_t index = 0; index < kComparedComponents; ++index) {
        // Null, for a missing component, is below every address.
        const std::string* left = component(a, index);
        const std::string* right = component(b, index);
        if (left != right) {
            const bool isAbove = right == nullptr || (left && std::greater<>()(left, right));
            return isAbove ? 1 : -1;
        }
    }
    return 0;
}

const std::vector<WLPerUserState::Entry>& WLPerUserState::_entries() {
    using State = WLPerUserState;
    static const auto* const entries = new std::vector<Entry>{
        {kPreviousSystemVersionKey, &State::_previousSystemVersion, nullptr, true},
        {kPreviousBuildVersionKey, &State::_previousBuildVersion, nullptr, true},
        {kDidSeeCloudSetupKey, nullptr, &State::_didSeeCloudSetup, true},
        {kLastSeenCloudProductVersionKey, &State::_lastSeenCloudProductVersion, nullptr, true},
        {kDidSeeSyncSetupKey, nullptr, &State::_didSeeSyncSetup, true},
        {kDidSeeSyncSetup2Key, nullptr, &State::_didSeeSyncSetup2, true},
        {kLastSeenSyncProductVersionKey, &State::_lastSeenSyncProductVersion, nullptr, true},
        {kLastPreLoginTasksPerformedBuildKey, &State::_lastPreLoginTasksPerformedBuild, nullptr, true},
        {kLastPreLoginTasksPerformedVersionKey, &State::_lastPreLoginTasksPerformedVersion, nullptr, true},
        {kSkipFirstLoginOptimizationKey, nullptr, &State::_skipFirstLoginOptimization, true},
        {kLastCacheCleanupProductVersionKey, &State::_lastCacheCleanupProductVersion, nullptr, false},
        {kLastCacheCleanupStillRunningKey, nullptr, &State::_lastCacheCleanupStillRunning, false},
        {kRunNonInteractiveKey, nullptr, &State::_runNonInteractive, true},
        {kShowKeychainSyncGreeterAtLoginKey, nullptr, &State::_showKeychainSyncGreeterAtLogin, true},
    };
    return *entries;
}

std::vector<std::string> WLPerUserState::_keys() {
    std::vector<std::string> keys;
    for (const Entry& entry : _entries()) {
        keys.push_back(entry.key);
    }
    return keys;
}

std::vector<WLPerUserState::Key> WLPerUserState::keys() {
    std::vector<Key> keys;
    for (const Entry& entry : _entries()) {
        keys.push_back({entry.key, entry.flag != nullptr});
    }
    return keys;
}

void WLPerUserState::setValueForKey(const std::string& key, const std::optional<PropertyList>& value) {
    for (const Entry& entry : _entries()) {
        if (entry.key == key && entry.text) {
            _setText(entry.text, std::optional(value));
        } else if (entry.key == key) {
            (this->*entry.flag).set(value && booleanReading(*value));
        }
    }
}

void WLPerUserState::_setText(Text WLPerUserState::*property, std::optional<PropertyList>&& value) {
    if (property == &WLPerUserState::_previousSystemVersion) {
        change(kPreviousSystemVersionProperty, [&] { _previousSystemVersion.set(std::move(value)); });
    } else {
        (this->*property).set(std::move(value));
    }
}

std::vector<std::string> WLPerUserState::keysAffecting(std::string_view derivedKey) const {
    if (derivedKey == kIsNewUserAccountProperty) {
        return {kPreviousSystemVersionProperty};
    }
    return {};
}

std::optional<PropertyList> WLPerUserState::_stringForKey(std::optional<PropertyList>&& stored) {
    return stored && stored->isString() ? std::move(stored) : std::nullopt;
}

bool WLPerUserState::_boolForKey(const std::optional<PropertyList>& stored) {
    return stored && stored->boolean().value_or(false);
}

void WLPerUserState::_setStringForKey(const std::optional<PropertyList>& string, const std::string& key) {
    platform::PreferenceStore& store = platform::current().preferenceStore;
    if (string) {
        store.setValue(key, *string, domain());
    } else {
        store.removeValue(key, domain());
    }
}

void WLPerUserState::_setBoolForKey(bool flag, const std::string& key) {
    platform::current().preferenceStore.setValue(key, flag, domain());
}

} // namespace welcomer
