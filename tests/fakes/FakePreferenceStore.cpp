#include "tests/fakes/FakePreferenceStore.h"

#include "propertylist/UnwritableValue.h"
#include "text/Describe.h"

#include <utility>

namespace welcomer::fakes {

namespace {

void apply(PropertyList::Dictionary& values, const std::string& key,
           const std::optional<PropertyList>& value) {
    if (value) {
        values.insert_or_assign(key, *value);
    } else {
        values.erase(key);
    }
}

} // namespace

FakePreferenceStore::Domain& FakePreferenceStore::use(const std::string& domain) {
    const auto [used, isNew] = _used.try_emplace(domain);
    if (isNew) {
        used->second.seen = _stored[domain];
    }
    return used->second;
}

std::optional<PropertyList> FakePreferenceStore::copyValue(const std::string& key,
                                                           const std::string& domain) {
    _recorder.record("PreferenceStore.copyValue " + domain + ", " + key);
    const std::lock_guard lock(_mutex);
    const Domain& used = use(domain);
    if (const auto change = used.changes.find(key); change != used.changes.end()) {
        return change->second;
    }
    const auto found = used.seen.find(key);
    return found == used.seen.end() ? std::nullopt : std::optional(found->second);
}

void FakePreferenceStore::setValue(const std::string& key, const PropertyList& value,
                                   const std::string& domain) {
    _recorder.record("PreferenceStore.setValue " + domain + ", " + key + " = " + text::describe(value));
    if (findUnwritableEntry(key, value)) {
        return;
    }
    const std::lock_guard lock(_mutex);
    use(domain).changes.insert_or_assign(key, value);
}

void FakePreferenceStore::removeValue(const std::string& key, const std::string& domain) {
    _recorder.record("PreferenceStore.removeValue " + domain + ", " + key);
    const std::lock_guard lock(_mutex);
    use(domain).changes.insert_or_assign(key, std::nullopt);
}

bool FakePreferenceStore::synchronise(const std::string& domain) {
    _recorder.record("PreferenceStore.synchronise " + domain);
    const std::lock_guard lock(_mutex);
    if (_failing.contains(domain)) {
        return false;
    }
    Domain& used = use(domain);
    for (const auto& [key, value] : std::exchange(used.changes, {})) {
        apply(_stored[domain], key, value);
    }
    used.seen = _stored[domain];
    return true;
}

std::vector<platform::DamagedPreferences> FakePreferenceStore::damagedPreferences() {
    _recorder.record("PreferenceStore.damagedPreferences");
    const std::lock_guard lock(_mutex);
    return _damaged;
}

PropertyList::Dictionary FakePreferenceStore::stored(const std::string& domain) const {
    const std::lock_guard lock(_mutex);
    const auto found = _stored.find(domain);
    return found == _stored.end() ? PropertyList::Dictionary() : found->second;
}

void FakePreferenceStore::store(const std::string& domain, const std::string& key,
                                const std::optional<PropertyList>& value) {
    const std::lock_guard lock(_mutex);
    apply(_stored[domain], key, value);
}

void FakePreferenceStore::setFailing(const std::string& domain, bool failing) {
    const std::lock_guard lock(_mutex);
    if (failing) {
        _failing.insert(domain);
    } else {
        _failing.erase(domain);
    }
}

void FakePreferenceStore::setDamagedPreferences(std::vector<platform::DamagedPreferences> damaged) {
    const std::lock_guard lock(_mutex);
    _damaged = std::move(damaged);
}

} // namespace welcomer::fakes
