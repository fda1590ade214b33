// welcomer services: the catalogue of services, and enabling those of one phase.

#include "cloud/WLNimbusServiceCatalogue.h"
#include "cloud/WLNimbusSetupWithDictionary.h"
#include "platform/Platform.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/story/PendingBlocks.h"
#include "tools/welcomer/story/ServiceStates.h"
#include "tools/welcomer/terminal/WaitingLine.h"

#include <algorithm>
#include <memory>
#include <mutex>

namespace welcomer::tool {

namespace {

struct EnableArguments {
    std::string account;
    std::string phase;
    std::string only;
    std::vector<std::string> selected;

    bool isPostLogin() const { return phase == "post"; }
};

// Keeps every line: they are all that enabling says.
class LineLog final : public KeptLog {
  public:
    void write(int priority, const std::string& message) override {
        KeptLog::write(priority, message);
        const std::lock_guard lock(_mutex);
        _lines.push_back(message);
    }
    std::vector<std::string> lines() const {
        const std::lock_guard lock(_mutex);
        return _lines;
    }

  private:
    mutable std::mutex _mutex; // delayed services are enabled on other threads
    std::vector<std::string> _lines;
};

Report list(Session& /*session*/) {
    Json services = Json::array();
    for (const CatalogueEntry& entry : serviceCatalogue()) {
        services.push_back({{"service", entry.name},
                            {"identifier", entry.identifier},
                            {"phase", entry.phase()},
                            {"delayed", entry.isDelayed}});
    }
    Report report;
    report.document = {{"services", services}};
    return report.table(
        services,
        {{"SERVICE", "service"}, {"PHASE", "phase"}, {"DELAYED", "delayed"}, {"IDENTIFIER", "identifier"}});
}

std::vector<std::string> serviceNames(Session& /*session*/) {
    std::vector<std::string> names;
    std::ranges::transform(serviceCatalogue(), std::back_inserter(names), &CatalogueEntry::name);
    return names;
}

std::vector<std::string> selectedServices(const std::vector<std::string>& names) {
    if (names.empty()) {
        return WLNimbusAllSetupServiceIDs();
    }
    std::vector<std::string> identifiers;
    std::ranges::transform(names, std::back_inserter(identifiers), serviceNamed);
    return identifiers;
}

std::vector<ServiceState> statesOf(const std::string& account) {
    return serviceStates(
        platform::current().accountService.sharedManager().accountForID(account, false).get());
}

// Calls the module and waits for what it puts off.
void enableAndWait(const EnableArguments& arguments, const std::vector<std::string>& selected,
                   PendingBlocks& blocks, const KeptLog& log, bool showsWaiting) {
    const PropertyList::Dictionary setup{{platform::kSKPropertyAccountID, arguments.account}};
    if (!WLNimbusSetupWithDictionary2(setup, selected, arguments.only == "kvs", arguments.isPostLogin(),
                                      nullptr, nullptr)) {
        throw CommandFailure("no service was enabled: " + log.reason());
    }
    const WaitingLine waiting("Waiting for the services that are enabled later", showsWaiting);
    blocks.wait();
}

Report enable(Session& session, const EnableArguments& arguments) {
    const std::vector<std::string> selected = selectedServices(arguments.selected);
    LineLog log;
    log.setVerbose(session.options.verbose);
    PendingBlocks blocks(platform::current().dispatchQueues);
    const auto owner = session.buildPlatform(
        {.root = session.options.root, .systemLog = &log, .dispatchQueues = &blocks}, TimeKind::Real);
    const platform::ScopedPlatform installed(owner->platform());

    enableAndWait(arguments, selected, blocks, log, !session.options.verbose);
    Report report;
    report.document = {{"account", arguments.account},
                       {"phase", arguments.isPostLogin() ? "post-login" : "pre-login"},
                       {"log", log.lines()},
                       {"services", toJson(statesOf(arguments.account))}};
    report.lines(log.lines()).line("");
    addServiceTable(report, report.document["services"]);
    return report;
}

} // namespace

void addServicesCommands(CommandLine& commandLine) {
    CommandLevel group = commandLine.addGroup("services", "The services of the cloud account");
    commandLine.addCommand(group, "list", "Show every service with the phase in which setup enables it",
                           list);

    commandLine.offerValues("SERVICE", serviceNames);
    const auto arguments = std::make_shared<EnableArguments>();
    CommandLevel command = commandLine.addCommand(
        group, "enable",
        "Enable an account's services of one phase and wait for those that are enabled later; what is "
        "decided about each is shown as it is logged. An account that is missing is made.",
        [arguments](Session& session) { return enable(session, *arguments); });
    command.option("--account", arguments->account, "The cloud account").called("USER").required();
    command.option("--phase", arguments->phase, "pre: before the first login; post: after it")
        .required()
        .oneOf({"pre", "post"});
    command.option("--only", arguments->only, "kvs: documents and data alone, whatever else is given")
        .oneOf({"kvs"});
    command
        .option("--select", arguments->selected,
                "A service that the user kept selected, by name or identifier; may be given several "
                "times. Without it every service is selected.")
        .called("SERVICE")
        .repeated();
    commandLine.addUserOption(command);
}

} // namespace welcomer::tool
