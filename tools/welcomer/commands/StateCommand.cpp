// welcomer state: the per-user record of what setup has done and shown.

#include "platform/Platform.h"
#include "propertylist/UnwritableValue.h"
#include "state/WLPerUserState.h"
#include "state/WLRecordSetupSeen.h"
#include "text/Describe.h"
#include "tools/welcomer/cli/PropertyListOutput.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/terminal/TextTable.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <memory>
#include <optional>
#include <ostream>

namespace welcomer::tool {

namespace {

// One key of the record: a text or a flag, and how it is set.
struct Key {
    const char* name;
    void (WLPerUserState::*setText)(const std::optional<std::string>&);
    void (WLPerUserState::*setFlag)(bool);
};

const Key kKeys[] = {
    {kPreviousSystemVersionKey, &WLPerUserState::setPreviousSystemVersion, nullptr},
    {kPreviousBuildVersionKey, &WLPerUserState::setPreviousBuildVersion, nullptr},
    {kDidSeeCloudSetupKey, nullptr, &WLPerUserState::setDidSeeCloudSetup},
    {kLastSeenCloudProductVersionKey, &WLPerUserState::setLastSeenCloudProductVersion, nullptr},
    {kDidSeeSyncSetupKey, nullptr, &WLPerUserState::setDidSeeSyncSetup},
    {kDidSeeSyncSetup2Key, nullptr, &WLPerUserState::setDidSeeSyncSetup2},
    {kLastSeenSyncProductVersionKey, &WLPerUserState::setLastSeenSyncProductVersion, nullptr},
    {kLastPreLoginTasksPerformedBuildKey, &WLPerUserState::setLastPreLoginTasksPerformedBuild, nullptr},
    {kLastPreLoginTasksPerformedVersionKey, &WLPerUserState::setLastPreLoginTasksPerformedVersion, nullptr},
    {kSkipFirstLoginOptimizationKey, nullptr, &WLPerUserState::setSkipFirstLoginOptimization},
    {kLastCacheCleanupProductVersionKey, &WLPerUserState::setLastCacheCleanupProductVersion, nullptr},
    {kLastCacheCleanupStillRunningKey, nullptr, &WLPerUserState::setLastCacheCleanupStillRunning},
    {kRunNonInteractiveKey, nullptr, &WLPerUserState::setRunNonInteractive},
    {kShowKeychainSyncGreeterAtLoginKey, nullptr, &WLPerUserState::setShowKeychainSyncGreeterAtLogin},
};

const Key& keyNamed(const std::string& name) {
    const auto* const found = std::ranges::find(kKeys, name, &Key::name);
    if (found == std::end(kKeys)) {
        throw UsageError("the record has no key " + name);
    }
    return *found;
}

bool flagIn(const std::string& value, const std::string& key) {
    if (value != "true" && value != "false") {
        throw UsageError(key + " is true or false, not " + value);
    }
    return value == "true";
}

bool isSuperuser() {
    return platform::current().processIdentity.effectiveUserID() == 0;
}

// The record, to be changed and stored.
WLPerUserState& recordToChange() {
    if (isSuperuser()) {
        // It starts empty for the superuser: storing it would erase what is there.
        throw CommandFailure("the superuser's record is not loaded and cannot be changed");
    }
    return WLPerUserState::currentPerUserState();
}

void storeRecord(const Session& session) {
    if (!WLPerUserState::currentPerUserState().writeToDefaults()) {
        throw CommandFailure("the record could not be stored: " + session.log.reason());
    }
}

std::string valueOf(const Key& key, const PropertyList::Dictionary& record) {
    const auto found = record.find(key.name);
    if (key.setFlag) {
        return found == record.end() ? "false" : "true";
    }
    return found == record.end() ? "-" : text::describe(found->second);
}

void show(Session& session) {
    const WLPerUserState& state = WLPerUserState::currentPerUserState();
    const PropertyList::Dictionary record = state.dictionaryRepresentation();
    if (session.options.json) {
        Json values = Json::object();
        for (const Key& key : kKeys) {
            const auto found = record.find(key.name);
            values[key.name] =
                found != record.end() ? toJson(found->second) : (key.setFlag ? Json(false) : Json());
        }
        printJson(
            session.out,
            {{"loaded", !isSuperuser()}, {"isNewUserAccount", state.isNewUserAccount()}, {"state", values}});
        return;
    }
    TextTable table({"KEY", "VALUE"});
    for (const Key& key : kKeys) {
        table.addRow({key.name, valueOf(key, record)});
    }
    table.print(session.out);
    session.out << (state.isNewUserAccount() ? "A new user account: no version of the system ran before.\n"
                                             : "Not a new user account.\n");
    if (isSuperuser()) {
        session.out << "The superuser's record is not loaded, whatever is stored.\n";
    }
}

void set(Session& session, const std::string& name, const std::string& value) {
    const Key& key = keyNamed(name);
    if (const auto unwritable = findUnwritableEntry(name, value)) {
        throw CommandFailure("the value could not be stored: " + *unwritable);
    }
    const Json stored = key.setFlag ? Json(flagIn(value, name)) : Json(value);
    WLPerUserState& state = recordToChange();
    if (key.setFlag) {
        (state.*key.setFlag)(stored.get<bool>());
    } else {
        (state.*key.setText)(value);
    }
    storeRecord(session);
    if (session.options.json) {
        printJson(session.out, {{"key", name}, {"value", stored}});
    } else {
        session.out << "Stored " << name << ".\n";
    }
}

void remove(Session& session, const std::string& name) {
    const Key& key = keyNamed(name);
    WLPerUserState& state = recordToChange();
    if (key.setFlag) {
        (state.*key.setFlag)(false);
    } else {
        (state.*key.setText)(std::nullopt);
    }
    storeRecord(session);
    if (session.options.json) {
        printJson(session.out, {{"key", name}, {"removed", true}});
    } else {
        session.out << "Removed " << name << ".\n";
    }
}

void recordSeen(Session& session, const std::string& setup) {
    recordToChange();
    if (setup == "cloud") {
        WLRecordCloudSetupSeen();
    } else {
        WLRecordSyncSetupSeen();
    }
    storeRecord(session);
    if (session.options.json) {
        printJson(session.out, {{"seen", setup}});
    } else {
        session.out << "Recorded the " << setup << " setup as seen.\n";
    }
}

} // namespace

void addStateCommands(CommandLine& commandLine) {
    CLI::App& group = commandLine.addGroup("state", "The user's record of what setup has done and shown");
    commandLine.addCommand(group, "show", "Show the record", show);

    const auto key = std::make_shared<std::string>();
    const auto value = std::make_shared<std::string>();
    CLI::App& setter = commandLine.addCommand(group, "set", "Set one value of the record and store it",
                                              [=](Session& session) { set(session, *key, *value); });
    setter.add_option("key", *key, "The value's key")->type_name("KEY")->required();
    setter.add_option("value", *value, "A text, or true or false for a flag")->type_name("VALUE")->required();

    CLI::App& remover =
        commandLine.addCommand(group, "remove", "Remove one value of the record; a flag becomes false",
                               [=](Session& session) { remove(session, *key); });
    remover.add_option("key", *key, "The value's key")->type_name("KEY")->required();

    const auto setup = std::make_shared<std::string>();
    CLI::App& seen = commandLine.addCommand(
        group, "seen", "Record that the cloud or the sync setup was seen, at the running system's version",
        [=](Session& session) { recordSeen(session, *setup); });
    seen.add_option("setup", *setup, "cloud or sync")->required()->check(CLI::IsMember({"cloud", "sync"}));
}

} // namespace welcomer::tool
