// welcomer sync: the decisions about offering sync and about where keychain sync goes.

#include "cloud/WLSetupProbes.h"
#include "platform/Platform.h"
#include "state/WLKeychainSyncDestination.h"
#include "state/WLSyncUpsell.h"
#include "tools/welcomer/cli/PropertyListFile.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/story/ScenarioHost.h"

#include <memory>
#include <optional>

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

std::string shown(bool flag) {
    return flag ? "true" : "false";
}

Report reportOn(const Decision& decision, const ScenarioHost& host) {
    const ScenarioHost::Flags& flags = host.flags();
    Report report;
    report.document = {{"result", decision.result},
                       {"destination", decision.destination ? Json(*decision.destination) : Json()},
                       {"name", decision.name ? Json(*decision.name) : Json()},
                       {"calls", host.calls()},
                       {"flags",
                        {{"backupIsEnabled", flags.backupIsEnabled},
                         {"isBackupNoCircleRecovery", flags.isBackupNoCircleRecovery},
                         {"abortSyncSetup", flags.abortSyncSetup}}}};
    report.fields({{"Result:", decision.result ? "keychain sync goes on" : "keychain sync is skipped"},
                   {"Destination:",
                    decision.destination ? std::to_string(*decision.destination) : "none was asked for"},
                   {"Name:", decision.name.value_or("none")},
                   {"Flags:", "backupIsEnabled " + shown(flags.backupIsEnabled) +
                                  ", isBackupNoCircleRecovery " + shown(flags.isBackupNoCircleRecovery) +
                                  ", abortSyncSetup " + shown(flags.abortSyncSetup)}});
    report.line("Calls:");
    for (const std::string& call : host.calls()) {
        report.line("  " + call);
    }
    return report;
}

Report determineDestination(Session& session, const std::string& file, bool checkOnly) {
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

    return reportOn(decide(host, checkOnly), host);
}

std::string reasonForNoUpsell(const Session& session) {
    if (!platform::current().accountService.loggedInAccount()) {
        return "nobody is logged in to a cloud account";
    }
    return session.log.isEmpty() ? "the user has seen it already" : session.log.reason();
}

Report decideUpsell(Session& session) {
    if (WLCurrentUserGetsSyncUpsell()) {
        return Report({{"offered", true}, {"reason", Json()}}, "The user is offered the sync setup.");
    }
    const std::string reason = reasonForNoUpsell(session);
    return Report({{"offered", false}, {"reason", reason}},
                  "The user is not offered the sync setup: " + reason);
}

} // namespace

void addSyncCommands(CommandLine& commandLine) {
    CommandLevel group = commandLine.addGroup("sync", "The decisions about sync");
    commandLine.addCommand(group, "upsell",
                           "Decide whether the user is offered the sync setup at this login; stores nothing",
                           decideUpsell);

    const auto file = std::make_shared<std::string>();
    const auto checkOnly = std::make_shared<bool>(false);
    CommandLevel destination = commandLine.addCommand(
        group, "destination", "Decide where keychain sync goes, for a host whose answers are given",
        [=](Session& session) { return determineDestination(session, *file, *checkOnly); });
    destination.option("--scenario", *file, "The host's answers, a property list of any format; - for stdin")
        .called("PLIST")
        .required();
    destination.flag("--check-only", *checkOnly, "Only check whether a rule skips keychain sync");
}

} // namespace welcomer::tool
