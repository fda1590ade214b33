// Preferences in memory, with what other processes see kept apart.

#pragma once

#include "platform/PreferenceStore.h"
#include "tests/fakes/CallRecorder.h"

#include <map>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <vector>

namespace welcomer::fakes {

// Recorded as "PreferenceStore.copyValue domain, key", "PreferenceStore.setValue domain, key = value",
// "PreferenceStore.removeValue domain, key" and "PreferenceStore.synchronise domain". Any thread.
class FakePreferenceStore final : public platform::PreferenceStore {
  public:
    explicit FakePreferenceStore(CallRecorder& recorder) : _recorder(recorder) {}

    std::optional<PropertyList> copyValue(const std::string& key, const std::string& domain) override;
    void setValue(const std::string& key, const PropertyList& value, const std::string& domain) override;
    void removeValue(const std::string& key, const std::string& domain) override;
    bool synchronise(const std::string& domain) override;
    std::vector<platform::DamagedPreferences> damagedPreferences() override;

    // What is stored, as another process sees it; changes that are not synchronised yet are not in it.
    PropertyList::Dictionary stored(const std::string& domain) const;

    // Stores a value as another process does; seen here when the domain is synchronised or first used.
    // Without a value, removes it. Nothing is recorded.
    void store(const std::string& domain, const std::string& key, const std::optional<PropertyList>& value);

    // Has synchronising a domain fail from now on, or no longer.
    void setFailing(const std::string& domain, bool failing);

    // What `damagedPreferences` gives.
    void setDamagedPreferences(std::vector<platform::DamagedPreferences> damaged);

  private:
    struct Domain {
        PropertyList::Dictionary seen;
        std::map<std::string, std::optional<PropertyList>> changes; // none: removed
    };

    // With _mutex held.
    Domain& use(const std::string& domain);

    CallRecorder& _recorder;
    mutable std::mutex _mutex;
    std::map<std::string, PropertyList::Dictionary> _stored;
    std::map<std::string, Domain> _used;
    std::set<std::string> _failing;
    std::vector<platform::DamagedPreferences> _damaged;
};

} // namespace welcomer::fakes
