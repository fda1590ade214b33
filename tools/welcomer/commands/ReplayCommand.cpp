// welcomer replay: the replay item, as the setup application leaves it for the agent.

#include "handoff/ReplayItem.h"
#include "handoff/WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup.h"
#include "propertylist/UnwritableValue.h"
#include "tools/welcomer/cli/PropertyListFile.h"
#include "tools/welcomer/cli/PropertyListOutput.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/story/HandOver.h"
#include "tools/welcomer/story/ReplayReason.h"
#include "tools/welcomer/story/SetupBundle.h"

#include <memory>

namespace welcomer::tool {

namespace {

struct StoreArguments {
    std::string account;
    std::string file;
    std::string bundle;
    PropertyList replayObject = {}; // what the file holds
};

void prepareStore(const Options& options, StoreArguments& arguments) {
    arguments.bundle = systemPath(options, "--bundle", arguments.bundle);
    arguments.replayObject = readPropertyListFile(arguments.file);
    // The writer would store an item without content in its place.
    if (const auto unwritable = findUnwritableValue(arguments.replayObject)) {
        throw CommandFailure(arguments.file + " cannot be stored: " + *unwritable);
    }
}

Report store(Session& session, const StoreArguments& arguments) {
    const platform::Platform& platform = platform::current();
    const std::string& bundlePath = arguments.bundle;
    if (!platform.fileSystem.exists(bundlePath)) {
        throw CommandFailure("there is no bundle at " + bundlePath +
                             (session.options.root == "/" ? "" : " below " + session.options.root));
    }
    const auto bundle = platform.resourceBundles.open(bundlePath);
    platform::CredentialOutcome stored;
    if (!WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup(
            arguments.account, arguments.replayObject, *bundle, stored)) {
        throw CommandFailure("cannot store the replay item and install the agent: " +
                             storingReason(session.log, stored));
    }
    return Report({{"account", arguments.account}, {"stored", true}},
                  "Stored the replay item for " + arguments.account +
                      " and installed the agent for the next login.");
}

// No store enforces an item's access: each says who can read the item in truth.
void addAccess(Report& report, const ReplayItem& found) {
    const platform::CredentialStoreDescription store = found.reference->store();
    report.line("Stored in: " + std::string(store.name));
    const std::optional<platform::CredentialAccess>& access = found.item.access;
    report.line("Access:    " + (access ? access->description : "the store's default"));
    if (access) {
        for (const platform::TrustedApplication& application : access->trustedApplications) {
            report.line("Trusted:   " + application.path);
        }
        report.line("           (kept with the item, but the " + std::string(store.name) +
                    " does not enforce it)");
    }
    report.line("Readers:   " + std::string(store.readers));
}

Report show(Session& session) {
    ReplayItem found;
    std::int32_t status = platform::kCredentialSuccess;
    if (!WLGetNimbusReplayKeychainItem(found, status)) {
        throw CommandFailure("cannot read the replay item: " + replayReason(session.log, status));
    }
    const std::string& account = found.item.label;
    Report report({{"account", account}, {"replay", toJson(found.replayObject)}}, "Account:   " + account);
    addAccess(report, found);
    return report.line("Replay object:").lines(outline(found.replayObject, "  "));
}

Report remove(Session& session) {
    std::int32_t status = platform::kCredentialSuccess;
    if (!WLDeleteNimbusReplayKeychainItem(status)) {
        throw CommandFailure("cannot delete the replay item: " + replayReason(session.log, status));
    }
    return Report({{"deleted", true}}, "Deleted the replay item.");
}

Report arm(Session& session, const std::string& bundle) {
    const bool wasInstalled = armAgent(session.log, *openSetupBundle(session.options, bundle));
    return Report({{"installed", wasInstalled}}, wasInstalled
                                                     ? "Installed the agent for the next login."
                                                     : "The agent is installed already for the next login.");
}

void addStore(CommandLine& commandLine, CommandLevel group) {
    const auto arguments = std::make_shared<StoreArguments>();
    CommandLevel command = commandLine.addCommand(
        group, "store",
        "Store the replay item and install the agent for the next login, as a setup application does",
        [arguments](Session& session) { return store(session, *arguments); });
    command.option("--account", arguments->account, "The user's cloud account name")
        .called("USER")
        .required();
    command.option("--file", arguments->file, "The replay object, a property list of any format; - for stdin")
        .called("PLIST")
        .required();
    command
        .option("--bundle", arguments->bundle,
                "The setup application's bundle; like every path of the system it is looked up below --root")
        .called("DIR")
        .required();
    commandLine.addLocalOption(command);
    commandLine.addUserOption(command);
    commandLine.addPreparation(command,
                               [arguments](const Options& options) { prepareStore(options, *arguments); });
}

void addArm(CommandLine& commandLine, CommandLevel group) {
    const auto bundle = std::make_shared<std::string>();
    CommandLevel command = commandLine.addCommand(
        group, "arm", "Install the agent for a replay item that waits, for which none would start",
        [bundle](Session& session) { return arm(session, *bundle); });
    addBundleOption(command, *bundle);
    commandLine.addUserOption(command);
    commandLine.addPreparation(
        command, [bundle](const Options& options) { *bundle = systemPath(options, "--bundle", *bundle); });
}

} // namespace

void addReplayCommands(CommandLine& commandLine) {
    CommandLevel group =
        commandLine.addGroup("replay", "The replay item, which waits for the agent of the next login");
    addStore(commandLine, group);
    addArm(commandLine, group);
    commandLine.addUserOption(
        commandLine.addCommand(group, "show", "Show the replay item; it stays where it is", show));
    commandLine.addUserOption(
        commandLine.addCommand(group, "delete", "Delete the replay item; the launch agent stays", remove));
}

} // namespace welcomer::tool
