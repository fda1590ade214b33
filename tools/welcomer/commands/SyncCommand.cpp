// welcomer sync: the decisions about offering sync and about where keychain sync goes.

#include "cloud/WLSetupProbes.h"
#include "platform/Platform.h"
#include "state/WLKeychainSyncDestination.h"
#include "state/WLSyncUpsell.h"
#include "tools/welcomer/cli/PropertyListFile.h"
#include "tools/welcomer/cli/PropertyListOutput.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/story/ScenarioHost.h"
#include "tools/welcomer/terminal/Printable.h"

#include <CLI/CLI.hpp>
#include <memory>
#include <optional>
#include <ostream>

namespace welcomer::tool {

namespace {

// A network whose one answer is given.
class GivenReachability final : public platform::HostReachability {
  public:
    explicit GivenReachability(bool isReachable)
        : _flags(isReachable ? std::uint32_t{platform::kHostReachable} : 0U) {}

    std::unique_ptr<platform::HostReachabilityTarget> createTarget(const std::string&) override {
        return std::make_unique<Target>(_flags);
    }

  private:
    class Target final : public platform::HostReachabilityTarget {
      public:
        explicit Target(std::uint32_t flags) : _flags(flags) {}
        std::optional<std::uint32_t> flags() override { return _flags; }

      private:
        std::uint32_t _flags;
    };

    std::uint32_t _flags;
};

struct Decision {
    bool result = false;
    std::optional<WLKeychainSyncDestination> destination;
    std::optional<std::string> name;
};

Decision decide(ScenarioHost& host, bool checkOnly) {
    Decision decision;
    decision.result = _WLDetermineKeychainSyncDestination(
        host, checkOnly, [&](WLKeychainSyncDestination destination) { decision.destination = destination; });
    if (decision.destination) {
        decision.name = WLKeychainSyncDestinationName(host, *decision.destination);
    }
    return decision;
}

void printAsJson(std::ostream& out, const Decision& decision, const ScenarioHost& host) {
    const ScenarioHost::Flags& flags = host.flags();
    printJson(out, {{"result", decision.result},
                    {"destination", decision.destination ? Json(*decision.destination) : Json()},
                    {"name", decision.name ? Json(*decision.name) : Json()},
                    {"calls", host.calls()},
                    {"flags",
                     {{"backupIsEnabled", flags.backupIsEnabled},
                      {"isBackupNoCircleRecovery", flags.isBackupNoCircleRecovery},
                      {"abortSyncSetup", flags.abortSyncSetup}}}});
}

void printForPeople(std::ostream& out, const Decision& decision, const ScenarioHost& host) {
    const ScenarioHost::Flags& flags = host.flags();
    out << "Result:       " << (decision.result ? "keychain sync goes on" : "keychain sync is skipped")
        << '\n';
    out << "Destination:  ";
    if (decision.destination) {
        out << *decision.destination << '\n';
    } else {
        out << "none was asked for\n";
    }
    out << "Name:         " << decision.name.value_or("none") << '\n';
    out << "Flags:        backupIsEnabled " << (flags.backupIsEnabled ? "true" : "false")
        << ", isBackupNoCircleRecovery " << (flags.isBackupNoCircleRecovery ? "true" : "false")
        << ", abortSyncSetup " << (flags.abortSyncSetup ? "true" : "false") << '\n';
    out << "Calls:\n";
    for (const std::string& call : host.calls()) {
        out << "  " << printable(call) << '\n';
    }
}

void determineDestination(Session& session, const std::string& file, bool checkOnly) {
    ScenarioHost host(readPropertyListFile(file));
    if (const auto answer = host.screenLockRequiresPassword()) {
        WLSetScreenLockRequiresPasswordOverride(*answer);
    }
    std::optional<GivenReachability> given;
    if (const auto answer = host.internetIsReachable()) {
        given.emplace(*answer);
    }
    const auto owner = session.buildPlatform({.root = session.options.root,
                                              .systemLog = &platform::current().systemLog,
                                              .hostReachability = given ? &*given : nullptr},
                                             TimeKind::Real);
    const platform::ScopedPlatform installed(owner->platform());

    const Decision decision = decide(host, checkOnly);
    if (session.options.json) {
        printAsJson(session.out, decision, host);
    } else {
        printForPeople(session.out, decision, host);
    }
}

std::string reasonForNoUpsell(const Session& session) {
    if (!platform::current().accountService.loggedInAccount()) {
        return "nobody is logged in to a cloud account";
    }
    return session.log.isEmpty() ? "the user has seen it already" : session.log.reason();
}

void decideUpsell(Session& session) {
    const bool isOffered = WLCurrentUserGetsSyncUpsell();
    if (session.options.json) {
        printJson(session.out, {{"offered", isOffered},
                                {"reason", isOffered ? Json() : Json(reasonForNoUpsell(session))}});
    } else if (isOffered) {
        session.out << "The user is offered the sync setup.\n";
    } else {
        session.out << "The user is not offered the sync setup: " << printable(reasonForNoUpsell(session))
                    << '\n';
    }
}

} // namespace

void addSyncCommands(CommandLine& commandLine) {
    CLI::App& group = commandLine.addGroup("sync", "The decisions about sync");
    commandLine.addCommand(group, "upsell",
                           "Decide whether the user is offered the sync setup at this login; stores nothing",
                           decideUpsell);

    const auto file = std::make_shared<std::string>();
    const auto checkOnly = std::make_shared<bool>(false);
    CLI::App& destination = commandLine.addCommand(
        group, "destination", "Decide where keychain sync goes, for a host whose answers are given",
        [=](Session& session) { determineDestination(session, *file, *checkOnly); });
    destination
        .add_option("--scenario", *file, "The host's answers, a property list of any format; - for stdin")
        ->type_name("PLIST")
        ->required();
    destination.add_flag("--check-only", *checkOnly, "Only check whether a rule skips keychain sync");
}

} // namespace welcomer::tool
