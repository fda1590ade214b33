// welcomer doctor: which backend serves each interface on this machine, and what is missing.

#include "platform/Path.h"
#include "platform/Platform.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/commands/ResolverReport.h"

#include <CLI/CLI.hpp>
#include <cstdlib>
#include <vector>

namespace welcomer::tool {

namespace {

using platform::BackendReport;

std::string runtimeFolder() {
    const char* const folder = std::getenv("XDG_RUNTIME_DIR");
    if (folder && *folder != '\0') {
        return folder;
    }
    return "/run/user/" + std::to_string(platform::current().processIdentity.effectiveUserID());
}

// Whether launch agents become services of their own.
BackendReport userManagerReport() {
    if (platform::current().fileSystem.exists(platform::joinPath(runtimeFolder(), "systemd/private"))) {
        return {"launch service", "user manager", "a user manager runs", ""};
    }
    return {"launch service", "child processes", "no user manager runs for this user",
            "log in to a session with systemd, so that each launch agent is a service of its own"};
}

std::vector<BackendReport> allReports(Session& session) {
    const auto owner = session.buildPlatform(
        {.root = session.options.root, .systemLog = &platform::current().systemLog}, TimeKind::Real);
    std::vector<BackendReport> reports = owner->backendReports();
    reports.push_back(userManagerReport());
    reports.push_back(resolverReport(session.options.root));
    return reports;
}

Report examine(Session& session) {
    Report report;
    report.document = {{"backends", Json::array()}};
    for (const BackendReport& each : allReports(session)) {
        report.document["backends"].push_back({{"interface", each.interface},
                                               {"backend", each.backend},
                                               {"reason", each.reason},
                                               {"advice", each.advice.empty() ? Json() : Json(each.advice)}});
        report.line(each.interface + ": " + each.backend + " (" + each.reason + ")");
        if (!each.advice.empty()) {
            report.line("    advice: " + each.advice);
        }
    }
    return report;
}

} // namespace

void addDoctorCommand(CommandLine& commandLine) {
    commandLine.addCommand(
        "doctor", "Show which service of the desktop serves what here, and what is missing", examine);
}

} // namespace welcomer::tool
