// Preferences as files: one XML property list per domain in the user's Library/Preferences.

#pragma once

#include "backends/local/DictionaryFile.h"
#include "backends/posix/RootFolder.h"
#include "platform/PreferenceStore.h"
#include "platform/ProcessIdentity.h"
#include "platform/SystemLog.h"

#include <map>
#include <mutex>
#include <optional>
#include <span>
#include <string>
#include <vector>

namespace welcomer::local {

// Synchronising with changes takes the folder's lock (FileLock.h), merges the keys that were changed here
// into what is on disk, writes a temporary file, syncs it and renames it over the old one: no change of
// another process is lost, and the file is whole at any time, old or new. A file that is a mount point of its
// own cannot be renamed over and is rewritten in place; a process that is killed in that moment leaves it
// damaged. A symbolic link in a file's place is read through, and replaced when the domain is written.
//
// Files of every property-list format are read, so that those of other tools are understood. A damaged file
// is renamed to "<domain>.plist.damaged", with a number where that name is taken. One that holds what XML
// cannot hold is left alone.
class LocalPreferenceStore final : public platform::PreferenceStore {
  public:
    //  root      the folder below which every path is looked up
    //  identity  says where the user's library is
    //  log       is told what is refused and what is damaged
    // Borrows both, which must outlive the store.
    LocalPreferenceStore(posix::RootFolder root, platform::ProcessIdentity& identity,
                         platform::SystemLog& log);

    std::optional<PropertyList> copyValue(const std::string& key, const std::string& domain) override;
    // As they are at one moment.
    std::vector<std::optional<PropertyList>> copyValues(std::span<const std::string> keys,
                                                        const std::string& domain) override;
    void setValue(const std::string& key, const PropertyList& value, const std::string& domain) override;
    void removeValue(const std::string& key, const std::string& domain) override;
    bool synchronise(const std::string& domain) override;
    std::vector<platform::DamagedPreferences> damagedPreferences() override;

  private:
    struct Domain {
        DictionaryFileContent onDisk;                               // as it was when it was last read
        std::map<std::string, std::optional<PropertyList>> changes; // none: removed
        std::string path; // of the file; empty until it is first needed
        bool isLoaded = false;
    };

    // All with _mutex held.
    Domain& _use(const std::string& name);
    const std::string& _library(); // empty for a user without a home
    std::string _folder();         // likewise
    LockedDictionaryFolder _lockedFolder();
    const std::string& _pathOf(const std::string& name, Domain& domain);
    bool _load(const std::string& name, Domain& domain);
    bool _storeChanges(const std::string& name, Domain& domain);
    // Reads a domain again with its folder locked, and sets it aside when it is damaged.
    //  result  false when the domain must be left alone
    bool _readLocked(const std::string& name, Domain& domain, LockedDictionaryFolder& folder);
    // Tells the system log why changes are not stored.
    void _noteNotStored(const std::string& name, const std::string& reason);
    void _noteDamage(const std::string& name, const std::string& reason, const std::string& setAsideName);

    const posix::RootFolder _root;
    platform::ProcessIdentity& _identity;
    platform::SystemLog& _log;
    std::mutex _mutex;
    std::optional<std::string> _userLibrary; // none until it is first needed
    std::map<std::string, Domain> _domains;
    decltype(_domains)::value_type* _lastUsed = nullptr; // mostly it is the next one, too
    std::vector<platform::DamagedPreferences> _damaged;
};

} // namespace welcomer::local
