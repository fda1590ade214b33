// welcomer doctor: which backend serves each interface on this machine, what is missing, and what is wrong.

#include "platform/Path.h"
#include "platform/Platform.h"
#include "tools/welcomer/checks/CodeFolders.h"
#include "tools/welcomer/checks/HandOverCheck.h"
#include "tools/welcomer/checks/LastLoginCheck.h"
#include "tools/welcomer/checks/PluginCheck.h"
#include "tools/welcomer/checks/UnitCheck.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/commands/ResolverReport.h"

#include <algorithm>
#include <cstdlib>
#include <vector>

namespace welcomer::tool {

namespace {

using platform::BackendReport;
using platform::SettingsReport;

constexpr char kSettingsSubject[] = "settings";

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

// Overrides that somebody has made and that have no effect.
Findings checkOverrides(const BackendReport& resolver) {
    const auto overrides = platform::current().fileSystem.list("/etc/resolver");
    const bool isWrong = overrides && !overrides->empty() && resolver.backend == "none";
    return isWrong ? Findings{{resolver.interface, Verdict::Wrong, resolver.reason, resolver.advice}}
                   : Findings{};
}

// A server for signing in that does not answer as it should.
Findings checkAccountServer(const std::vector<BackendReport>& backends) {
    const auto server = std::ranges::find(backends, "SignInDirectory", &BackendReport::interface);
    const bool isWrong = server != backends.end() && !server->advice.empty();
    return isWrong ? Findings{{"account server", Verdict::Wrong, server->reason, server->advice}}
                   : Findings{};
}

// What the doctor has seen.
struct Examination {
    std::vector<BackendReport> backends;
    SettingsReport settings;
    std::string pluginFolder;
    Findings findings;
};

Examination lookAtAll(Session& session) {
    const auto owner = session.buildPlatform(
        {.root = session.options.root, .systemLog = &platform::current().systemLog}, TimeKind::Real);
    const platform::ScopedPlatform installed(owner->platform());
    Examination seen{owner->backendReports(), owner->settings(), "", {}};
    seen.backends.push_back(userManagerReport());
    seen.backends.push_back(resolverReport(session.options.root));
    seen.pluginFolder = owner->pluginFolder();

    const auto add = [&](const Findings& more) {
        seen.findings.insert(seen.findings.end(), more.begin(), more.end());
    };
    const auto credentials = std::ranges::find(seen.backends, "CredentialStore", &BackendReport::interface);
    add({checkHandOver(*credentials), checkLastLogin(session.options.root)});
    add(checkPlugins(session.options, seen.pluginFolder));
    add({checkLoadedCode()}); // the services have been asked, and their modules are loaded
    add(checkUnits(session.options.root == "/"));
    add(checkOverrides(seen.backends.back()));
    add(checkAccountServer(seen.backends));
    for (const std::string& problem : seen.settings.problems) {
        add({{kSettingsSubject, Verdict::Wrong, problem, "see welcomer-platform.conf(5)"}});
    }
    return seen;
}

const char* nameOf(Verdict verdict) {
    return verdict == Verdict::Right ? "right" : verdict == Verdict::Wrong ? "wrong" : "unknown";
}

Json orNull(const std::string& text) {
    return text.empty() ? Json() : Json(text);
}

void addBackends(Report& report, const std::vector<BackendReport>& backends) {
    report.document["backends"] = Json::array();
    for (const BackendReport& each : backends) {
        report.document["backends"].push_back({{"interface", each.interface},
                                               {"backend", each.backend},
                                               {"reason", each.reason},
                                               {"advice", orNull(each.advice)}});
        report.line(each.interface + ": " + each.backend + " (" + each.reason + ")");
        if (!each.advice.empty()) {
            report.line("    advice: " + each.advice);
        }
    }
}

void addFindings(Report& report, const Findings& findings) {
    report.document["checks"] = Json::array();
    for (const Finding& each : findings) {
        report.document["checks"].push_back({{"subject", each.subject},
                                             {"state", nameOf(each.verdict)},
                                             {"text", each.text},
                                             {"advice", orNull(each.advice)}});
        const char* const mark = each.verdict == Verdict::Wrong ? "WRONG  " : "";
        report.line(mark + each.subject + ": " + each.text);
        if (!each.advice.empty()) {
            report.line("    advice: " + each.advice);
        }
    }
}

void addSettings(Report& report, const SettingsReport& settings) {
    Json rows = Json::array();
    for (const platform::SettingReport& each : settings.settings) {
        rows.push_back({{"setting", each.name}, {"value", each.value}, {"origin", each.origin}});
    }
    report.document["settings"] = rows;
    report.table(rows, {{"SETTING", "setting"}, {"VALUE", "value"}, {"FROM", "origin"}});
}

Report examine(Session& session) {
    const Examination seen = lookAtAll(session);
    Report report;
    report.document = {{"pluginFolder", seen.pluginFolder}};
    addBackends(report, seen.backends);
    report.line("");
    addFindings(report, seen.findings);
    report.line("");
    addSettings(report, seen.settings);
    const auto wrong = std::ranges::count(seen.findings, Verdict::Wrong, &Finding::verdict);
    if (wrong > 0) {
        report.failure = wrong == 1 ? "one thing is wrong" : std::to_string(wrong) + " things are wrong";
    }
    return report;
}

} // namespace

void addDoctorCommand(CommandLine& commandLine) {
    commandLine.addCommand(
        "doctor", "Show which service of the desktop serves what here, what is missing, and what is wrong",
        examine);
}

} // namespace welcomer::tool
