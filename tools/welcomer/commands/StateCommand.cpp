// welcomer state: the per-user record of what setup has done and shown.

#include "platform/Platform.h"
#include "propertylist/UnwritableValue.h"
#include "state/WLPerUserState.h"
#include "state/WLRecordSetupSeen.h"
#include "text/Describe.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"

#include <algorithm>
#include <iterator>
#include <memory>
#include <optional>

namespace welcomer::tool {

namespace {

using Key = WLPerUserState::Key;

Key keyNamed(const std::string& name) {
    const std::vector<Key> keys = WLPerUserState::keys();
    const auto found = std::ranges::find(keys, name, &Key::name);
    if (found == keys.end()) {
        throw UsageError("the record has no key " + name);
    }
    return *found;
}

std::vector<std::string> keyNames(Session& /*session*/) {
    std::vector<std::string> names;
    std::ranges::transform(WLPerUserState::keys(), std::back_inserter(names), &Key::name);
    return names;
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
    if (key.isFlag) {
        return found == record.end() ? "false" : "true";
    }
    return found == record.end() ? "-" : text::describe(found->second);
}

Report show(Session& /*session*/) {
    const WLPerUserState& state = WLPerUserState::currentPerUserState();
    const PropertyList::Dictionary record = state.dictionaryRepresentation();
    Json values = Json::object();
    TextTable table({"KEY", "VALUE"});
    for (const Key& key : WLPerUserState::keys()) {
        const auto found = record.find(key.name);
        values[key.name] =
            found != record.end() ? toJson(found->second) : (key.isFlag ? Json(false) : Json());
        table.addRow({key.name, valueOf(key, record)});
    }
    Report report;
    report.document = {
        {"loaded", !isSuperuser()}, {"isNewUserAccount", state.isNewUserAccount()}, {"state", values}};
    report.table(std::move(table));
    report.line(state.isNewUserAccount() ? "A new user account: no version of the system ran before."
                                         : "Not a new user account.");
    if (isSuperuser()) {
        report.line("The superuser's record is not loaded, whatever is stored.");
    }
    return report;
}

Report set(Session& session, const std::string& name, const std::string& value) {
    const Key key = keyNamed(name);
    if (const auto unwritable = findUnwritableEntry(name, value)) {
        throw CommandFailure("the value could not be stored: " + *unwritable);
    }
    const PropertyList stored = key.isFlag ? PropertyList(flagIn(value, name)) : PropertyList(value);
    recordToChange().setValueForKey(name, stored);
    storeRecord(session);
    return Report({{"key", name}, {"value", toJson(stored)}}, "Stored " + name + ".");
}

Report remove(Session& session, const std::string& name) {
    const Key key = keyNamed(name);
    recordToChange().setValueForKey(key.name, std::nullopt);
    storeRecord(session);
    return Report({{"key", name}, {"removed", true}}, "Removed " + name + ".");
}

Report recordSeen(Session& session, const std::string& setup) {
    recordToChange();
    if (setup == "cloud") {
        WLRecordCloudSetupSeen();
    } else {
        WLRecordSyncSetupSeen();
    }
    storeRecord(session);
    return Report({{"seen", setup}}, "Recorded the " + setup + " setup as seen.");
}

} // namespace

void addStateCommands(CommandLine& commandLine) {
    CommandLevel group = commandLine.addGroup("state", "The user's record of what setup has done and shown");
    commandLine.addUserOption(commandLine.addCommand(group, "show", "Show the record", show));
    commandLine.offerValues("KEY", keyNames);

    const auto key = std::make_shared<std::string>();
    const auto value = std::make_shared<std::string>();
    CommandLevel setter =
        commandLine.addCommand(group, "set", "Set one value of the record and store it",
                               [=](Session& session) { return set(session, *key, *value); });
    setter.option("key", *key, "The value's key").called("KEY").required();
    setter.option("value", *value, "A text, or true or false for a flag").called("VALUE").required();
    commandLine.addUserOption(setter);

    CommandLevel remover =
        commandLine.addCommand(group, "remove", "Remove one value of the record; a flag becomes false",
                               [=](Session& session) { return remove(session, *key); });
    remover.option("key", *key, "The value's key").called("KEY").required();
    commandLine.addUserOption(remover);

    const auto setup = std::make_shared<std::string>();
    CommandLevel seen = commandLine.addCommand(
        group, "seen", "Record that the cloud or the sync setup was seen, at the running system's version",
        [=](Session& session) { return recordSeen(session, *setup); });
    seen.option("setup", *setup, "cloud or sync").required().oneOf({"cloud", "sync"});
    commandLine.addUserOption(seen);
}

} // namespace welcomer::tool
