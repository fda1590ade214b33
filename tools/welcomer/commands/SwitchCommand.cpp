// welcomer switch: which environment of the cloud service this machine's resolver is pointed to.

#include "switch/SwitchController.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"

#include <algorithm>
#include <memory>

namespace welcomer::tool {

namespace {

Json currentAsJson(const SwitchController& controller) {
    const auto name = controller.theCurrentServerName();
    return name ? Json(*name) : Json();
}

Report list(Session& /*session*/) {
    SwitchController& controller = SwitchController::sharedController();
    Report report;
    report.document = {{"servers", controller.availableServers()}, {"current", currentAsJson(controller)}};
    for (const std::string& name : controller.availableServers()) {
        report.line((name == controller.theCurrentServerName() ? "* " : "  ") + name);
    }
    return report;
}

Report show(Session& /*session*/) {
    const SwitchController& controller = SwitchController::sharedController();
    return Report(
        {{"current", currentAsJson(controller)},
         {"isPointedToProd", controller.isPointedToProd()},
         {"canChangeConfiguration", controller.canChangeConfiguration()}},
        controller.theCurrentServerName().value_or("Unknown: the overrides are not the switch's own"));
}

Report select(Session& session, const std::string& name) {
    SwitchController& controller = SwitchController::sharedController();
    const auto& names = controller.availableServers();
    const auto found = std::ranges::find(names, name);
    if (found == names.end()) {
        throw UsageError("there is no environment " + name);
    }
    if (!controller.canChangeConfiguration()) {
        throw CommandFailure("only the superuser can switch the environment");
    }
    controller.setSelectedIndex(static_cast<std::uint64_t>(found - names.begin()));
    if (controller.theCurrentServerName() != name) {
        throw CommandFailure("cannot switch to " + name + ": " + session.log.reason());
    }
    return Report({{"current", name}}, "Pointed to " + name + ".");
}

} // namespace

void addSwitchCommands(CommandLine& commandLine) {
    CommandLevel group =
        commandLine.addGroup("switch", "The cloud service's environment that the resolver is pointed to");
    commandLine.addCommand(group, "list", "List the environments; a star marks the current one", list);
    commandLine.addCommand(group, "show", "Show the current environment", show);
    commandLine.offerValues("ENVIRONMENT", [](Session& /*session*/) {
        return SwitchController::sharedController().availableServers();
    });
    const auto name = std::make_shared<std::string>();
    CommandLevel selector = commandLine.addCommand(
        group, "select",
        "Point the resolver at an environment; every file in /etc/resolver is replaced. For the superuser",
        [=](Session& session) { return select(session, *name); });
    selector.option("name", *name, "The environment's name, or Prod").called("ENVIRONMENT").required();
}

} // namespace welcomer::tool
