#include "switch/SwitchController.h"

#include "generated/WelcomerConfiguration.h"
#include "log/PCLogManager.h"
#include "platform/Platform.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <string_view>
#include <utility>

namespace welcomer {

namespace {

constexpr char kClassName[] = "SwitchController";
constexpr char kReadFunction[] = "-[SwitchController _readInitialConfiguration]";
constexpr char kWriteFunction[] = "-[SwitchController _writeConfigForServer:]";

constexpr char kResolverDirectory[] = "/etc/resolver";
constexpr std::uint32_t kResolverDirectoryMode = 0755;
constexpr char kProductionName[] = "Prod";
constexpr char kCurrentServerNameKey[] = "theCurrentServerName";

constexpr std::array<std::string_view, 8> kEnvironmentNames = {"Nimbus1", "Nimbus2", "Nimbus3", "Nimbus4",
                                                               "Q1",      "Q2",      "Q3",      "Q4"};
static_assert(kEnvironmentNames.size() == configuration::kTestNameservers.size());

// The error numbers that are no failures here.
constexpr int kNoSuchFile = 2;
constexpr int kFileExists = 17;

std::string overridePath(const std::string& domain) {
    return kResolverDirectory + ("/" + domain);
}

// The first line that mentions a nameserver anywhere, or none.
std::optional<std::string_view> nameserverLine(std::string_view text) {
    while (true) {
        const std::size_t end = text.find('\n');
        const std::string_view line = text.substr(0, end);
        if (line.find("nameserver") != std::string_view::npos) {
            return line;
        }
        if (end == std::string_view::npos) {
            return std::nullopt;
        }
        text.remove_prefix(end + 1);
    }
}

std::string_view trimmedToAddress(std::string_view line) {
    constexpr std::string_view kAddressCharacters = "0123456789.";
    const std::size_t first = line.find_first_of(kAddressCharacters);
    if (first == std::string_view::npos) {
        return {};
    }
    return line.substr(first, line.find_last_of(kAddressCharacters) - first + 1);
}

} // namespace

SwitchController& SwitchController::sharedController() {
    static auto* const controller = new SwitchController;
    return *controller;
}

SwitchController::SwitchController()
    : _serverNames(configuration::kResolverDomains.begin(), configuration::kResolverDomains.end()) {
    for (std::size_t index = 0; index < kEnvironmentNames.size(); ++index) {
        _qaIPsByName.emplace(kEnvironmentNames[index], configuration::kTestNameservers[index]);
    }
    _readInitialConfiguration();
}

bool SwitchController::isPointedToProd() const {
    return _theCurrentServerName == kProductionName;
}

bool SwitchController::canChangeConfiguration() const {
    return !_toldOtherwise && platform::current().processIdentity.effectiveUserID() == 0;
}

void SwitchController::setCanChangeConfiguration(bool /*ignored*/) {
    _toldOtherwise = true;
}

const std::vector<std::string>& SwitchController::availableServers() {
    if (!_displayNames) {
        _displayNames = std::vector<std::string>{kProductionName};
        for (const auto& [name, nameserver] : _qaIPsByName) { // a map is in the order of its keys' characters
            _displayNames->push_back(name);
        }
    }
    return *_displayNames;
}

std::uint64_t SwitchController::selectedIndex() {
    const std::vector<std::string>& names = availableServers();
    const auto found = std::ranges::find(names, _theCurrentServerName);
    return found == names.end() ? kNotFoundIndex : static_cast<std::uint64_t>(found - names.begin());
}

void SwitchController::setSelectedIndex(std::uint64_t index) {
    const std::string name = availableServers().at(index);
    if (name != _theCurrentServerName && _writeConfigForServer(name)) {
        _setTheCurrentServerName(name);
    }
}

void SwitchController::_readInitialConfiguration() {
    std::optional<std::string> name = kProductionName;
    const std::optional<std::string> text =
        platform::current().fileSystem.readText(overridePath(_serverNames.back()));
    if (text) {
        name = _serverInOverride(*text);
    }
    if (!name) {
        // A file that is there and not understood means an unknown environment; a missing one, production.
        WL_LOG_AS(kReadFunction, "%@ isn't smart enough to parse:\n%@", kClassName, *text);
        return;
    }
    WL_LOG_AS(kReadFunction, "%@ thinks we are pointed to %@", kClassName, *name);
    _setTheCurrentServerName(*name);
}

std::optional<std::string> SwitchController::_serverInOverride(const std::string& text) const {
    const std::optional<std::string_view> line = nameserverLine(text);
    if (!line) {
        return std::nullopt;
    }
    const std::string_view nameserver = trimmedToAddress(*line);
    const auto found =
        std::ranges::find_if(_qaIPsByName, [&](const auto& each) { return each.second == nameserver; });
    return found == _qaIPsByName.end() ? std::nullopt : std::optional(found->first);
}

bool SwitchController::_writeConfigForServer(const std::string& name) {
    if (!canChangeConfiguration()) {
        WL_LOG_AS(kWriteFunction, "%@ doesn't have permission to write QA dns configuration", kClassName);
        return false;
    }
    if (!_removeOverrides()) {
        return false;
    }
    if (name == kProductionName) {
        WL_LOG_AS(kWriteFunction, "%@ returned to prod", kClassName);
        return true;
    }
    // The overrides are gone before the name is looked up: an unknown name leaves the machine at production.
    const auto environment = _qaIPsByName.find(name);
    if (environment == _qaIPsByName.end()) {
        WL_LOG_AS(kWriteFunction, "%@ is confused by server name %@", kClassName, name);
        return false;
    }
    for (const std::string& domain : _serverNames) {
        if (!_writeOverride(domain, environment->second)) {
            return false;
        }
    }
    WL_LOG_AS(kWriteFunction, "%@ redirected to %@", kClassName, name);
    return true;
}

bool SwitchController::_removeOverrides() const {
    const platform::Outcome removed = platform::current().fileSystem.remove(kResolverDirectory);
    if (!removed && removed.error.number != kNoSuchFile) {
        WL_LOG_AS(kWriteFunction, "%@ failed to remove previous config: %@", kClassName, removed.error);
        return false;
    }
    return true;
}

bool SwitchController::_writeOverride(const std::string& domain, const std::string& nameserver) const {
    platform::FileSystem& files = platform::current().fileSystem;
    if (!files.exists(kResolverDirectory)) {
        const platform::Outcome created = files.createDirectory(kResolverDirectory, kResolverDirectoryMode);
        if (!created && created.error.number != kFileExists) {
            WL_LOG_AS(kWriteFunction, "%@ failed to create %@: %@", kClassName, kResolverDirectory,
                      created.error);
            return false;
        }
    }
    const std::string path = overridePath(domain);
    const platform::Outcome written = files.writeText(
        path, text::format("# Switch override for Nimbus\ndomain %@\nnameserver %@\n", domain, nameserver));
    if (!written) {
        WL_LOG_AS(kWriteFunction, "%@ failed to write %@: %@", kClassName, path, written.error);
        return false;
    }
    return true;
}

void SwitchController::_setTheCurrentServerName(const std::string& name) {
    change(kCurrentServerNameKey, [&] { _theCurrentServerName = name; });
}

} // namespace welcomer
