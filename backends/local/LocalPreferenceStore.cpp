#include "backends/local/LocalPreferenceStore.h"

#include "platform/Path.h"

#include <algorithm>
#include <utility>

namespace welcomer::local {

namespace {

using State = PreferenceFileContent::State;

constexpr char kFolderName[] = "Preferences";

std::string fileName(const std::string& domain) {
    return domain + ".plist";
}

// Whether a domain can have a file.
bool isDomainName(const std::string& name) {
    return !name.empty() && name.find('/') == std::string::npos && name.find('\0') == std::string::npos;
}

} // namespace

LocalPreferenceStore::LocalPreferenceStore(RootFolder root, platform::ProcessIdentity& identity)
    : _root(std::move(root)),
      _identity(identity) {}

std::optional<PropertyList> LocalPreferenceStore::copyValue(const std::string& key,
                                                            const std::string& domain) {
    const std::lock_guard lock(_mutex);
    Domain& used = _domains[domain];
    if (const auto change = used.changes.find(key); change != used.changes.end()) {
        return change->second;
    }
    if (!used.isLoaded) {
        _load(domain, used);
    }
    const auto found = used.seen.find(key);
    return found == used.seen.end() ? std::nullopt : std::optional(found->second);
}

void LocalPreferenceStore::setValue(const std::string& key, const PropertyList& value,
                                    const std::string& domain) {
    const std::lock_guard lock(_mutex);
    _domains[domain].changes.insert_or_assign(key, value);
}

void LocalPreferenceStore::removeValue(const std::string& key, const std::string& domain) {
    const std::lock_guard lock(_mutex);
    _domains[domain].changes.insert_or_assign(key, std::nullopt);
}

bool LocalPreferenceStore::synchronise(const std::string& domain) {
    const std::lock_guard lock(_mutex);
    Domain& used = _domains[domain];
    return used.changes.empty() ? _load(domain, used) : _storeChanges(domain, used);
}

std::vector<platform::DamagedPreferences> LocalPreferenceStore::damagedPreferences() {
    const std::lock_guard lock(_mutex);
    return _damaged;
}

const std::string& LocalPreferenceStore::_folder() {
    if (!_userFolder) {
        const std::vector<std::string> libraries = _identity.userLibraryDirectories();
        _userFolder = platform::joinPath(libraries.empty() ? "/Library" : libraries.front(), kFolderName);
    }
    return *_userFolder;
}

bool LocalPreferenceStore::_load(const std::string& name, Domain& domain) {
    domain.isLoaded = true;
    domain.seen.clear();
    if (!isDomainName(name)) {
        return false;
    }
    PreferenceFileContent content =
        readPreferenceFile(_root.locate(platform::joinPath(_folder(), fileName(name))));
    if (content.state == State::Damaged) {
        // What was read may be a file that is being rewritten in place; with the lock it is what it is.
        const LockedPreferenceFolder folder(_root.locate(_folder()));
        if (!folder) {
            _noteDamage(name, content.reason, {});
            return true;
        }
        domain.seen = _readLocked(name, folder).value_or(PropertyList::Dictionary());
        return true;
    }
    domain.seen = std::move(content.values);
    return content.state == State::Whole;
}

bool LocalPreferenceStore::_storeChanges(const std::string& name, Domain& domain) {
    if (!isDomainName(name)) {
        return false;
    }
    const LockedPreferenceFolder folder(_root.locate(_folder()));
    if (!folder) {
        return false;
    }
    const std::optional<PropertyList::Dictionary> stored = _readLocked(name, folder);
    if (!stored) {
        return false;
    }
    PropertyList::Dictionary merged = *stored;
    for (const auto& [key, value] : domain.changes) {
        if (value) {
            merged.insert_or_assign(key, *value);
        } else {
            merged.erase(key);
        }
    }
    if (merged != *stored && !folder.write(fileName(name), merged)) {
        return false;
    }
    domain.seen = std::move(merged);
    domain.changes.clear();
    domain.isLoaded = true;
    return true;
}

std::optional<PropertyList::Dictionary>
LocalPreferenceStore::_readLocked(const std::string& name, const LockedPreferenceFolder& folder) {
    PreferenceFileContent content =
        readPreferenceFile(_root.locate(platform::joinPath(_folder(), fileName(name))));
    if (content.state == State::Whole) {
        return std::move(content.values);
    }
    if (content.state == State::Unreadable) {
        return std::nullopt;
    }
    const std::string other = folder.setAside(fileName(name), content.bytes);
    _noteDamage(name, content.reason, other);
    return other.empty() ? std::nullopt : std::optional<PropertyList::Dictionary>(std::in_place);
}

void LocalPreferenceStore::_noteDamage(const std::string& name, const std::string& reason,
                                       const std::string& setAsideName) {
    const platform::DamagedPreferences damage{
        name, reason, setAsideName.empty() ? std::string() : platform::joinPath(_folder(), setAsideName)};
    // What cannot be set aside is met again by each reading.
    if (std::ranges::count(_damaged, damage) == 0) {
        _damaged.push_back(damage);
    }
}

} // namespace welcomer::local
