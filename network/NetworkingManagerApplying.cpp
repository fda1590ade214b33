// What the user wants, stored and applied.

#include "network/NetworkingManager.h"

#include "log/PCLogManager.h"
#include "network/NCUtils.h"
#include "network/WLPortScanner.h"
#include "platform/Platform.h"
#include "propertylist/UTF8.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <exception>
#include <limits>
#include <string_view>
#include <utility>
#include <vector>

namespace welcomer {

namespace {

using Text = NetworkingManager::Text;
using TextList = NetworkingManager::TextList;
using Dictionary = PropertyList::Dictionary;

constexpr char kPreferencesName[] = "com.corvid.FirstRun";
constexpr char kDebugDefault[] = "WLNetworkingManagerDebug";
constexpr char kNoAddress[] = "0.0.0.0";
constexpr int kMaximumRetries = 60;
constexpr std::chrono::seconds kOneSecond{1};
constexpr char kPreferencesFunction[] = "-[NetworkingManager systemPreferences]";
constexpr char kApplyFunction[] = "-[NetworkingManager applySettings:]";
constexpr char kManualFunction[] = "-[NetworkingManager configureManual]";
constexpr char kServiceFunction[] = "-[NetworkingManager configureService:]";
constexpr char kDNSFunction[] = "-[NetworkingManager _setManualDNS:dns:]";
constexpr char kCommitFunction[] = "-[NetworkingManager commitPrefs]";
constexpr char kRegisterFunction[] = "-[NetworkingManager registerNewNetworkServices]";

// A value that a configuration cannot go without.
const std::string& required(const Text& value, const char* name) {
    if (!value) {
        throw platform::Exception(std::string("no ") + name + " was given");
    }
    return *value;
}

PropertyList::Array onlyElement(const std::string& value) {
    return {PropertyList(value)};
}

// The last error of a connection to the store, as log lines show it.
struct StoreError {
    explicit StoreError(const platform::NetworkConfigHandle& handle)
        : code(handle.lastErrorCode()),
          text(handle.lastErrorText()) {}

    const std::int32_t code;
    const std::string text;

    long number() const { return code; }
    const char* characters() const { return text.c_str(); }
};

// Commits and applies; a failure whose code is 0 does not stop it.
//  result  whether nothing stopped it
bool storeEstablished(platform::NetworkConfigConnection& preferences, const char* function) {
    if (!preferences.commitChanges()) {
        const StoreError error(preferences);
        WL_LOG_AS(function, "NCPreferencesCommitChanges failed error code %ld error %s", error.number(),
                  error.characters());
        preferences.synchronize();
        if (error.code != 0) {
            return false;
        }
    }
    if (!preferences.applyChanges()) {
        const StoreError error(preferences);
        WL_LOG_AS(function, "NCPreferencesApplyChanges failed error code %ld error %s", error.number(),
                  error.characters());
        if (error.code != 0) {
            return false;
        }
    }
    WL_LOG_AS(function, "updated network configuration");
    return true;
}

Dictionary errorDictionary(const char* titleKey, const char* bodyKey) {
    const auto bundle = platform::current().resourceBundles.openMainBundle();
    return {{"title", bundle->localizedString(titleKey, "")}, {"body", bundle->localizedString(bodyKey, "")}};
}

std::string_view withoutLeadingSpaces(std::string_view text) {
    return text.substr(std::min(text.find_first_not_of(' '), text.size()));
}

} // namespace

std::shared_ptr<platform::NetworkConfigConnection> NetworkingManager::systemPreferences() {
    if (_prefs) {
        return _prefs;
    }
    const platform::Platform& platform = platform::current();
    std::shared_ptr<platform::NetworkSet> set;
    for (long retries = 0;; ++retries) {
        if (retries > 0) {
            WL_LOG_AS(kPreferencesFunction, "waiting for network configuration to be established (%ld)",
                      retries);
            platform.clock.sleep(kOneSecond);
            _prefs.reset();
        }
        _prefs = platform.networkConfigStore.open(kPreferencesName);
        set = _prefs->copyCurrentSet();
        if (set) {
            break;
        }
        if (machinePortList().empty() || retries >= kMaximumRetries) {
            return _prefs;
        }
    }
    if (set->establishDefaultConfiguration()) {
        storeEstablished(*_prefs, kPreferencesFunction);
    } else {
        const StoreError error(*set); // also when nothing went wrong
        WL_LOG_AS(kPreferencesFunction, "NCNetworkSetEstablishDefaultConfiguration returned %ld error %s",
                  error.number(), error.characters());
    }
    return _prefs;
}

std::shared_ptr<platform::NetworkSet> NetworkingManager::_currentSet() {
    return systemPreferences()->copyCurrentSet();
}

bool NetworkingManager::applySettings(PropertyList::Dictionary* error) {
    const std::uint64_t warningType = _internetConnectionWarningType;
    const bool configuresLAN = userSaidConfigureLAN();
    _wasRefusedByStore = false;
    const auto failed = [&](PropertyList::Dictionary dictionary) {
        if (error) {
            *error = std::move(dictionary);
        }
        return false;
    };
    bool result = true;
    if (configuresLAN && warningType != 0 && !configureManual()) {
        return failed(genericConfigurationErrorDict());
    }
    if (warningType == 1) {
        _waitForInternet(result);
    }
    if (warningType == 2 || (warningType == 1 && !result)) {
        return failed(genericReachabilityErrorDict());
    }
    return result;
}

void NetworkingManager::_waitForInternet(bool& isReachable) const {
    // Counted without a sign, so that a negative wait runs around without overflowing.
    const auto wait = static_cast<std::uint64_t>(_secondsToWait);
    constexpr auto kEnd = std::numeric_limits<std::uint64_t>::max(); // -1
    std::uint64_t counter = wait;
    do {
        isReachable = internetIsReachable();
        if (isReachable) {
            break;
        }
        platform::current().clock.sleep(kOneSecond);
        --counter;
    } while (counter != kEnd);
    WL_LOG_AS(kApplyFunction, "%@: Internet is %@reachable after %lu seconds", *this,
              isReachable ? "" : "not ", wait - counter);
}

PropertyList::Dictionary NetworkingManager::genericReachabilityErrorDict() {
    return errorDictionary("NETWORKING_MANAGER_NO_INTERNET_TITLE", "NETWORKING_MANAGER_NO_INTERNET_BODY");
}

PropertyList::Dictionary NetworkingManager::genericConfigurationErrorDict() {
    return errorDictionary("NETWORKING_MANAGER_GENERIC_ERROR_TITLE", "NETWORKING_MANAGER_GENERIC_ERROR_BODY");
}

bool NetworkingManager::configureManual() {
    if (platform::current().preferenceStore.booleanDefault(kDebugDefault)) {
        WL_LOG_AS(kManualFunction, "NetworkingManager: Configuring manual ethernet");
        WL_LOG_AS(kManualFunction, "Method: %@", configurationMethod());
        WL_LOG_AS(kManualFunction, "IP:     %@", ipAddress());
        WL_LOG_AS(kManualFunction, "Subnet: %@", subnetMask());
        WL_LOG_AS(kManualFunction, "Router: %@", router());
        WL_LOG_AS(kManualFunction, "DNS:    %@", dns());
        WL_LOG_AS(kManualFunction, "Search: %@", searchDomains());
    }
    bool result = false;
    try {
        Text key = _hardwareKey();
        if (!key) {
            WL_LOG_AS(kManualFunction, "NetworkingManager: no Connection specified, assuming %@",
                      platform::kNetworkEthernet);
            key = platform::kNetworkEthernet;
        }
        const auto set = _currentSet();
        if (*key != platform::kNetworkEthernet) {
            const auto service = NCUtils::serviceInSetWithHardwareKey(set.get(), key);
            if (!service) {
                throw platform::Exception("unable to find service for connection type");
            }
            service->setEnabled(true); // before configuring, unlike below
            result = configureService(*service);
        } else if (const auto plugged = servicesWithEthernetPluggedIn(); plugged && !plugged->empty()) {
            result = configureService(*plugged->front());
            plugged->front()->setEnabled(true);
        } else {
            for (const auto& service :
                 NCUtils::servicesInSetWithHardwareKey(set.get(), key).value_or(Services())) {
                result = configureService(*service);
                service->setEnabled(true);
            }
        }
    } catch (const std::exception&) {
        // The result so far is the answer.
    }
    return result;
}

bool NetworkingManager::configureService(platform::NetworkService& service) {
    _wasRefusedByStore = false;
    try {
        _configureService(service);
    } catch (const std::exception&) {
        return false;
    }
    _wasRefusedByStore = !commitPrefs();
    return !_wasRefusedByStore;
}

void NetworkingManager::_configureService(platform::NetworkService& service) {
    static constexpr std::array<std::pair<const char*, const char*>, 4> kMethods = {{
        {kConfigurationMethodManual, platform::kNetworkMethodManual},
        {kConfigurationMethodManualDHCP, platform::kNetworkMethodInform},
        {kConfigurationMethodDHCP, platform::kNetworkMethodDHCP},
        {kConfigurationMethodBootP, platform::kNetworkMethodBootP},
    }};
    if (!_hardwareKey()) {
        WL_LOG_AS(kServiceFunction, "NetworkingManager: no Connection specified, assuming %@",
                  platform::kNetworkEthernet);
    }
    std::string method = platform::kNetworkMethodDHCP;
    const Text chosen = configurationMethod();
    const auto* const known =
        std::ranges::find_if(kMethods, [&](const auto& each) { return chosen == each.first; });
    if (known == kMethods.end()) {
        WL_LOG_AS(kServiceFunction, "NetworkingManager: no TCPConfigureMethod specified, assuming %@",
                  method);
    } else {
        method = known->second;
    }
    const auto protocol = NCUtils::createOrGetProtocolForService(platform::kNetworkProtocolIPv4, &service);
    if (!protocol) {
        throw platform::Exception("missing IPv4 protocol in service");
    }
    Dictionary configuration = protocol->configuration().value_or(Dictionary());
    configuration.insert_or_assign(platform::kNetworkConfigMethod, method);
    if (method == platform::kNetworkMethodDHCP) {
        _setDHCPIP4(configuration);
    } else if (method == platform::kNetworkMethodManual) {
        _setManualIP4(configuration);
    } else if (method == platform::kNetworkMethodInform) {
        _setManualDHCPIP4(configuration);
    }
    if (!protocol->setConfiguration(configuration)) {
        const StoreError error(*protocol);
        _wasRefusedByStore = true;
        WL_LOG_AS(kServiceFunction,
                  "NetworkingManager: NCNetworkProtocolSetConfiguration failed error code %ld error %s",
                  error.number(), error.characters());
    }
    _setManualDNSDns(service, dns());
}

void NetworkingManager::_setManualIP4(PropertyList::Dictionary& configuration) const {
    configuration.insert_or_assign(platform::kNetworkAddresses,
                                   onlyElement(required(ipAddress(), "address")));
    configuration.insert_or_assign(platform::kNetworkSubnetMasks,
                                   onlyElement(required(subnetMask(), "subnet mask")));
    configuration.insert_or_assign(platform::kNetworkRouter, required(router(), "router"));
}

void NetworkingManager::_setDHCPIP4(PropertyList::Dictionary& configuration) const {
    if (const Text clientID = dhcpClientID()) {
        configuration.insert_or_assign(platform::kNetworkDHCPClientID, *clientID);
    }
}

void NetworkingManager::_setManualDHCPIP4(PropertyList::Dictionary& configuration) const {
    configuration.insert_or_assign(platform::kNetworkAddresses,
                                   onlyElement(required(ipAddress(), "address")));
}

void NetworkingManager::_setManualDNSDns(platform::NetworkService& service, const TextList& dns) const {
    const auto protocol = NCUtils::createOrGetProtocolForService(platform::kNetworkProtocolDNS, &service);
    if (!protocol) {
        throw platform::Exception("missing DNS protocol in service");
    }
    Dictionary configuration = protocol->configuration().value_or(Dictionary());
    PropertyList::Array kept;
    for (const std::string& entry : dns.value_or(std::vector<std::string>())) {
        const std::string_view address = withoutLeadingSpaces(entry); // spaces behind it stay
        if (address.empty()) {
            continue;
        }
        if (findInvalidUTF8(address) != std::string_view::npos) { // no text that could be copied
            WL_LOG_AS(kDNSFunction, "*** _setManualDNS bad DNS %@", entry);
        } else if (address != kNoAddress) {
            kept.emplace_back(address);
        }
    }
    // The search domains are asked for and never written.
    static_cast<void>(searchDomains());
    if (kept.empty()) {
        return;
    }
    configuration.insert_or_assign(platform::kNetworkServerAddresses, std::move(kept));
    if (!protocol->setConfiguration(configuration)) {
        const StoreError error(*protocol);
        WL_LOG_AS(kDNSFunction, "Error %ld from NCNetworkProtocolSetConfiguration", error.number());
    }
}

bool NetworkingManager::commitPrefs() {
    const auto preferences = systemPreferences();
    if (!preferences->commitChanges()) {
        const StoreError error(*preferences);
        WL_LOG_AS(kCommitFunction,
                  "NetworkingManager: NCPreferencesCommitChanges failed error code %ld error %s",
                  error.number(), error.characters());
        preferences->synchronize();
        return error.code == 0; // a failure without a code counts as success, on purpose
    }
    if (!preferences->applyChanges()) {
        const StoreError error(*preferences);
        WL_LOG_AS(kCommitFunction,
                  "NetworkingManager: NCPreferencesApplyChanges failed error code %ld error %s",
                  error.number(), error.characters());
        return error.code == 0;
    }
    return true;
}

void NetworkingManager::registerNewNetworkServices() {
    _wasRefusedByStore = false;
    const auto preferences = systemPreferences();
    const auto set = preferences->copyCurrentSet();
    if (!set) {
        WL_LOG_AS(kRegisterFunction, "NCNetworkSetCopyCurrent failed");
        return;
    }
    if (!set->establishDefaultConfiguration()) {
        WL_LOG_AS(kRegisterFunction, "NCNetworkSetEstablishDefaultConfiguration : no new devices.");
        return;
    }
    _wasRefusedByStore = !storeEstablished(*preferences, kRegisterFunction);
}

} // namespace welcomer
