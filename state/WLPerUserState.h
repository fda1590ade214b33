// What first-run setup has done and shown for the logged-in user, kept in the user's preferences.

#pragma once

#include "platform/Atomic.h"
#include "platform/Observable.h"
#include "propertylist/PropertyList.h"

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer {

// The preference domain of the record.
inline constexpr char kPerUserStateDomain[] = "com.corvid.FirstRun";

// The record's preference keys, in their canonical order.
inline constexpr char kPreviousSystemVersionKey[] = "PreviousSystemVersion";
inline constexpr char kPreviousBuildVersionKey[] = "PreviousBuildVersion";
inline constexpr char kDidSeeCloudSetupKey[] = "DidSeeCloudSetup";
inline constexpr char kLastSeenCloudProductVersionKey[] = "LastSeenCloudProductVersion";
inline constexpr char kDidSeeSyncSetupKey[] = "DidSeeSyncSetup";
inline constexpr char kDidSeeSyncSetup2Key[] = "DidSeeSyncSetup2";
inline constexpr char kLastSeenSyncProductVersionKey[] = "LastSeenSyncProductVersion";
inline constexpr char kLastPreLoginTasksPerformedBuildKey[] = "LastPreLoginTasksPerformedBuild";
inline constexpr char kLastPreLoginTasksPerformedVersionKey[] = "LastPreLoginTasksPerformedVersion";
inline constexpr char kSkipFirstLoginOptimizationKey[] = "SkipFirstLoginOptimization";
inline constexpr char kLastCacheCleanupProductVersionKey[] = "LastCacheCleanupProductVersion";
inline constexpr char kLastCacheCleanupStillRunningKey[] = "LastCacheCleanupStillRunning";
inline constexpr char kRunNonInteractiveKey[] = "RunNonInteractive";
inline constexpr char kShowKeychainSyncGreeterAtLoginKey[] = "ShowKeychainSyncGreeterAtLogin";

// Every property begins as none or false. Each is read and written indivisibly by any thread; nothing holds
// several of them together, so that a record which is written while another thread changes it may be stored
// as a mix. Changes reach the store through `writeToDefaults` alone. A text that came as another type from a
// dictionary reads as none, and is written as it came.
//
// Observers of "previousSystemVersion", and of "isNewUserAccount", which derives from it, are told whenever
// the former is set.
class WLPerUserState final : public platform::Observable {
  public:
    // The one shared record, made on first use as any other, never destroyed and never loaded again. Any
    // thread.
    static WLPerUserState& currentPerUserState();

    // Loads what is stored, unless the process runs as the superuser.
    WLPerUserState();

    // The same, and then takes what the dictionary holds under twelve of the keys: texts unchecked, whatever
    // their type, flags by their boolean reading. What it holds about the cache clean-up is deliberately not
    // taken.
    static std::unique_ptr<WLPerUserState>
    initWithDictionaryRepresentation(const PropertyList::Dictionary& dictionary);

    // Clears the previous versions, and tells observers so.
    ~WLPerUserState() override;

    // The texts that are there and the flags that are true, under all fourteen keys.
    PropertyList::Dictionary dictionaryRepresentation() const;

    std::optional<std::string> previousSystemVersion() const;
    void setPreviousSystemVersion(const std::optional<std::string>& version);
    std::optional<std::string> previousBuildVersion() const;
    void setPreviousBuildVersion(const std::optional<std::string>& version);
    // Both, the system's version first.
    void setPreviousSystemVersionBuildVersion(const std::optional<std::string>& systemVersion,
                                              const std::optional<std::string>& buildVersion);
    bool didSeeCloudSetup() const;
    void setDidSeeCloudSetup(bool didSee);
    std::optional<std::string> lastSeenCloudProductVersion() const;
    void setLastSeenCloudProductVersion(const std::optional<std::string>& version);
    bool didSeeSyncSetup() const;
    void setDidSeeSyncSetup(bool didSee);
    bool didSeeSyncSetup2() const;
    void setDidSeeSyncSetup2(bool didSee);
    std::optional<std::string> lastSeenSyncProductVersion() const;
    void setLastSeenSyncProductVersion(const std::optional<std::string>& version);
    std::optional<std::string> lastPreLoginTasksPerformedBuild() const;
    void setLastPreLoginTasksPerformedBuild(const std::optional<std::string>& build);
    std::optional<std::string> lastPreLoginTasksPerformedVersion() const;
    void setLastPreLoginTasksPerformedVersion(const std::optional<std::string>& version);
    bool skipFirstLoginOptimization() const;
    void setSkipFirstLoginOptimization(bool skip);
    std::optional<std::string> lastCacheCleanupProductVersion() const;
    void setLastCacheCleanupProductVersion(const std::optional<std::string>& version);
    bool lastCacheCleanupStillRunning() const;
    void setLastCacheCleanupStillRunning(bool isRunning);
    bool runNonInteractive() const;
    void setRunNonInteractive(bool runNonInteractive);
    bool showKeychainSyncGreeterAtLogin() const;
    void setShowKeychainSyncGreeterAtLogin(bool show);

    // The keys in their canonical order, with what their properties are.
    struct Key {
        std::string name;
        bool isFlag = false; // a text otherwise
    };
    static std::vector<Key> keys();

    // Sets the property that has this key: a text or a flag, which none makes none or false; nothing for a
    // key that is none of the record's.
    void setValueForKey(const std::string& key, const std::optional<PropertyList>& value);

    // Whether the user has never run a system before: the previous version is missing or empty, is "0" or
    // begins with "0.".
    bool isNewUserAccount() const;

    // Stores all fourteen properties; texts that are missing remove their keys, flags are stored either way.
    //  result  whether they are stored now
    // May block while another process stores preferences.
    bool writeToDefaults();

    // Sees what others have stored, and sets all fourteen properties from it; values of the wrong type read
    // as none or false.
    void _loadFromDefaults();

    // Orders two system versions: -1, 0 or 1. A missing version is below every other. Two that are there are
    // split at their points into fresh components, and those are ordered as below: even a version compared
    // with itself need not give 0.
    static int _compareSystemVersionWith(const std::optional<std::string>& a,
                                         const std::optional<std::string>& b);

    // Orders the first three components one after the other. A missing one is below every other; two that
    // are there are ordered by which objects they are, deliberately not by their texts.
    using VersionComponents = std::vector<std::shared_ptr<const std::string>>;
    static int _compareComponentsWith(const VersionComponents& a, const VersionComponents& b);

  private:
    using Text = platform::Atomic<std::optional<PropertyList>>; // as it came
    using Flag = platform::Atomic<bool>;

    // One property and its preference key; exactly one of the two is set.
    struct Entry {
        std::string key;
        Text WLPerUserState::*text;
        Flag WLPerUserState::*flag;
        bool isTakenFromDictionary;
    };
    static const std::vector<Entry>& _entries(); // in canonical order
    static std::vector<std::string> _keys();     // theirs

    // Every change of a text goes through here.
    void _setText(Text WLPerUserState::*property, std::optional<PropertyList>&& value);

    std::vector<std::string> keysAffecting(std::string_view derivedKey) const override;

    // The store.
    // What is stored for a key as its property takes it: a string or none, a boolean or false.
    static std::optional<PropertyList> _stringForKey(std::optional<PropertyList>&& stored);
    static bool _boolForKey(const std::optional<PropertyList>& stored);
    static void _setStringForKey(const std::optional<PropertyList>& string, const std::string& key);
    static void _setBoolForKey(bool flag, const std::string& key);

    Text _previousSystemVersion;
    Text _previousBuildVersion;
    Flag _didSeeCloudSetup;
    Text _lastSeenCloudProductVersion;
    Flag _didSeeSyncSetup;
    Flag _didSeeSyncSetup2;
    Text _lastSeenSyncProductVersion;
    Text _lastPreLoginTasksPerformedBuild;
    Text _lastPreLoginTasksPerformedVersion;
    Flag _skipFirstLoginOptimization;
    Text _lastCacheCleanupProductVersion;
    Flag _lastCacheCleanupStillRunning;
    Flag _runNonInteractive;
    Flag _showKeychainSyncGreeterAtLogin;
};

} // namespace welcomer
