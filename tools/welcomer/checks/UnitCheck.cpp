#include "tools/welcomer/checks/UnitCheck.h"

#include "platform/Platform.h"
#include "tools/welcomer/checks/ChildOutput.h"

#include <algorithm>
#include <map>
#include <sstream>

namespace welcomer::tool {

namespace {

using namespace std::chrono_literals;
using Properties = std::map<std::string, std::string>;

constexpr char kSubject[] = "units";
constexpr char kLaunchUnit[] = "welcomer-launch-agents.service";
constexpr char kAutostart[] = "/etc/xdg/autostart/welcomer-launch-agents.desktop";
constexpr const char* kUserUnitFolders[] = {"/etc/systemd/user/", "/usr/local/lib/systemd/user/",
                                            "/usr/lib/systemd/user/"};
constexpr const char* kSystemUnits[] = {"welcomer-resolver-sync.service", "welcomer-restore-network.service"};
constexpr auto kLimit = 10s; // for one answer of a service manager

bool exists(const std::string& path) {
    return platform::current().fileSystem.exists(path);
}

// What a service manager knows of a unit; nothing where none answers.
Properties propertiesOf(const char* unit, bool isUsers) {
    std::vector<std::string> command{"systemctl"};
    if (isUsers) {
        command.emplace_back("--user");
    }
    command.insert(command.end(), {"show", "--property=LoadState,UnitFileState,ActiveState,Result", unit});
    std::istringstream lines(outputOf(command, kLimit).text);
    Properties properties;
    for (std::string line; std::getline(lines, line);) {
        const std::size_t equals = line.find('=');
        if (equals != std::string::npos) {
            properties[line.substr(0, equals)] = line.substr(equals + 1);
        }
    }
    return properties;
}

// The unit that starts the agents, as the user's service manager has it.
Finding checkLaunchUnit() {
    Properties properties = propertiesOf(kLaunchUnit, true);
    const std::string unit = std::string("the user's unit ") + kLaunchUnit;
    if (properties.empty()) {
        return {kSubject, Verdict::Right, unit + " is installed; no service manager runs for this user"};
    }
    if (properties["LoadState"] != "loaded") {
        return {kSubject, Verdict::Wrong, unit + " is not loaded: " + properties["LoadState"],
                std::string("systemctl --user daemon-reload; a masked unit: systemctl --user unmask ") +
                    kLaunchUnit};
    }
    if (properties["ActiveState"] == "failed") {
        return {kSubject, Verdict::Wrong, unit + " has failed: " + properties["Result"],
                std::string("journalctl --user -u ") + kLaunchUnit};
    }
    if (properties["UnitFileState"] == "disabled") {
        return {kSubject, Verdict::Wrong, unit + " is disabled",
                std::string("systemctl --user enable ") + kLaunchUnit};
    }
    return {kSubject, Verdict::Right, unit + " starts agents at a login"};
}

Finding checkWhatStartsAgents(bool isWholeMachine) {
    const bool hasUnit = std::ranges::any_of(
        kUserUnitFolders, [](const char* folder) { return exists(std::string(folder) + kLaunchUnit); });
    if (hasUnit && isWholeMachine) {
        return checkLaunchUnit();
    }
    if (hasUnit || exists(kAutostart)) {
        return {kSubject, Verdict::Right,
                std::string(hasUnit ? kLaunchUnit : kAutostart) + " starts agents at a login"};
    }
    return {kSubject, Verdict::Wrong, "nothing starts agents at a login", "install the package welcomer"};
}

} // namespace

Findings checkUnits(bool isWholeMachine) {
    Findings findings{checkWhatStartsAgents(isWholeMachine)};
    if (!isWholeMachine || !exists("/run/systemd/system")) {
        return findings;
    }
    for (const char* const unit : kSystemUnits) {
        Properties properties = propertiesOf(unit, false);
        if (properties["ActiveState"] == "failed") {
            findings.push_back({kSubject, Verdict::Wrong,
                                std::string("the unit ") + unit + " has failed: " + properties["Result"],
                                std::string("journalctl -u ") + unit});
        }
    }
    return findings;
}

} // namespace welcomer::tool
