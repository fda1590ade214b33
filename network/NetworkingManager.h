// The network as setup sees it: what is configured now, what the user wants, and whether it works.

#pragma once

#include "platform/Atomic.h"
#include "platform/NetworkConfigStore.h"
#include "propertylist/PropertyList.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {

// The values of `userChoice` that mean something, and of `configurationMethod`.
inline constexpr char kUserChoiceWiFi[] = "wifi";
inline constexpr char kUserChoiceLAN[] = "lan";
inline constexpr char kUserChoiceNoInternet[] = "no";
inline constexpr char kConfigurationMethodManual[] = "Manual";
inline constexpr char kConfigurationMethodManualDHCP[] = "Manual DHCP";
inline constexpr char kConfigurationMethodDHCP[] = "DHCP";
inline constexpr char kConfigurationMethodBootP[] = "BootP";

// Made once per setup run. The texts and lists may be read and set on any thread; everything else, the two
// integers among it, is for one thread at a time and blocks it.
class NetworkingManager {
  public:
    using Text = std::optional<std::string>;
    using TextList = std::optional<std::vector<std::string>>;
    using Services = std::vector<std::shared_ptr<platform::NetworkService>>;

    // Reads what the machine is configured to now.
    NetworkingManager();
    virtual ~NetworkingManager() = default;
    NetworkingManager(const NetworkingManager&) = delete;
    NetworkingManager& operator=(const NetworkingManager&) = delete;

    // What the user wants, as the setup application sets it before it applies it: none at first.
    Text userChoice() const { return _userChoice.get(); }
    void setUserChoice(Text value) { _userChoice.set(std::move(value)); }
    Text configurationMethod() const { return _configurationMethod.get(); }
    void setConfigurationMethod(Text value) { _configurationMethod.set(std::move(value)); }
    Text ipAddress() const { return _ipAddress.get(); }
    void setIpAddress(Text value) { _ipAddress.set(std::move(value)); }
    Text subnetMask() const { return _subnetMask.get(); }
    void setSubnetMask(Text value) { _subnetMask.set(std::move(value)); }
    Text router() const { return _router.get(); }
    void setRouter(Text value) { _router.set(std::move(value)); }
    TextList dns() const { return _dns.get(); }
    void setDns(TextList value) { _dns.set(std::move(value)); }
    TextList searchDomains() const { return _searchDomains.get(); }
    void setSearchDomains(TextList value) { _searchDomains.set(std::move(value)); }
    Text dhcpClientID() const { return _dhcpClientID.get(); }
    void setDhcpClientID(Text value) { _dhcpClientID.set(std::move(value)); }

    // What `applySettings` checks: 0 nothing, and it configures nothing; 1 that the internet can be reached;
    // 2 fails always; any other value nothing.
    std::uint64_t internetConnectionWarningType() const { return _internetConnectionWarningType; }
    void setInternetConnectionWarningType(std::uint64_t value) { _internetConnectionWarningType = value; }

    // How long `applySettings` waits until the internet can be reached. A negative number is not guarded: the
    // wait then lasts until a 64-bit counter has run once around.
    std::int64_t secondsToWaitForInternetReachability() const { return _secondsToWait; }
    void setSecondsToWaitForInternetReachability(std::int64_t value) { _secondsToWait = value; }

    // What was found when this was made: the primary service's method, first address and first mask, the
    // global router, DNS servers and domain. All none when it had no address or a link-local one, and each
    // when it was not there.
    Text defaultConfigurationMethod() const { return _defaultConfigurationMethod.get(); }
    Text defaultIPAddress() const { return _defaultIPAddress.get(); }
    Text defaultSubnetMask() const { return _defaultSubnetMask.get(); }
    Text defaultRouter() const { return _defaultRouter.get(); }
    TextList defaultDNS() const { return _defaultDNS.get(); }
    TextList defaultSearchDomains() const { return _defaultSearchDomains.get(); }

    // Always none.
    Text defaultDhcpClientID() const { return _defaultDhcpClientID.get(); }

    // The method that is stored for the service of the user's choice, or none.
    Text defaultIP4ConfigurationMethod();

    // Whether the user has made exactly that choice.
    bool userSaidConfigureWiFi() const { return userChoice() == kUserChoiceWiFi; }
    bool userSaidConfigureLAN() const { return userChoice() == kUserChoiceLAN; }
    bool userSaidNoInternetForNow() const { return userChoice() == kUserChoiceNoInternet; }

    // The connection to the store that all operations share; opened on first use, with the services for new
    // hardware stored. Blocks for up to 60 seconds while the machine has ports but no set yet. Never null.
    std::shared_ptr<platform::NetworkConfigConnection> systemPreferences();

    // Whether the internet can be reached: the public web host is reachable without a connection having to be
    // brought up first. False also when that cannot be found out. Blocks for as long as the platform takes to
    // answer. Any thread.
    static bool internetIsReachable();

    // Whether this machine is on the maker's own network: its address begins as addresses there do and the
    // marker "/CorvidInternal" exists. Any thread.
    static bool isOnCorvidInternalNetwork();

    // The Ethernet services whose link is active, in the set's order; none when they cannot be listed.
    std::optional<Services> servicesWithEthernetPluggedIn();
    bool isEthernetCablePluggedIn();

    // Whether the Ethernet service gets its address by itself and the internet can be reached. False when the
    // primary service has an address already, on purpose.
    bool hasUsableDynamicEthernetConfiguration();

    // Whether at least three nodes of the directory search path can be reached; false when the path has only
    // local ones.
    bool dirServiceNodesExist();

    // Configures what the user chose, where that is the wired network, and checks the result as
    // `internetConnectionWarningType` says. Blocks for up to `secondsToWaitForInternetReachability` + 1
    // seconds, apart from the platform.
    //  error   receives an error dictionary on failure; may be null
    //  result  success
    bool applySettings(PropertyList::Dictionary* error);

    // An error dictionary: the texts "title" and "body" of the application's main bundle, empty where it has
    // none.
    static PropertyList::Dictionary genericReachabilityErrorDict();
    static PropertyList::Dictionary genericConfigurationErrorDict();

    // Writes the user's settings into the service of the user's choice and has the machine use them.
    //  result  success; what raises ends it with the result so far
    bool configureManual();

    // The same for one service; false, with nothing committed, when something raises.
    bool configureService(platform::NetworkService& service);

    // Stores and applies the changes made through `systemPreferences`; a commit that fails is undone.
    //  result  whether the error code was 0, which a failed call may also give
    bool commitPrefs();

    // Adds services for hardware that has none, stores and applies that. What came of it is logged.
    void registerNewNetworkServices();

    // Whether it was the store that did not take what `applySettings` or `registerNewNetworkServices` last
    // had for it; its error is in the line that was logged last then.
    bool wasRefusedByStore() const { return _wasRefusedByStore; }

  protected:
    // The interface type of the user's choice: Ethernet for "lan", wireless for everything else, no choice
    // among it. Never none here; callers cope with none.
    virtual Text _hardwareKey() const;

  private:
    void _readDefaultConfiguration();
    static Text _currentDHCPAddress();

    std::shared_ptr<platform::NetworkSet> _currentSet();
    void _waitForInternet(bool& isReachable) const;
    void _configureService(platform::NetworkService& service);
    void _setManualIP4(PropertyList::Dictionary& configuration) const;
    void _setDHCPIP4(PropertyList::Dictionary& configuration) const;
    void _setManualDHCPIP4(PropertyList::Dictionary& configuration) const;
    void _setManualDNSDns(platform::NetworkService& service, const TextList& dns) const;

    std::shared_ptr<platform::NetworkConfigConnection> _prefs;
    bool _wasRefusedByStore = false;
    [[maybe_unused]] bool _readDefaults = false; // declared, never set or read
    platform::Atomic<Text> _userChoice;
    std::int64_t _secondsToWait = 0;
    platform::Atomic<Text> _defaultConfigurationMethod;
    platform::Atomic<Text> _defaultIPAddress;
    platform::Atomic<Text> _defaultSubnetMask;
    platform::Atomic<Text> _defaultRouter;
    platform::Atomic<TextList> _defaultDNS;
    platform::Atomic<TextList> _defaultSearchDomains;
    [[maybe_unused]] platform::Atomic<Text> _defaultDHCPClientID; // declared, never set or read
    platform::Atomic<Text> _configurationMethod;
    platform::Atomic<Text> _ipAddress;
    platform::Atomic<Text> _subnetMask;
    platform::Atomic<Text> _router;
    platform::Atomic<TextList> _dns;
    platform::Atomic<TextList> _searchDomains;
    platform::Atomic<Text> _dhcpClientID;
    std::uint64_t _internetConnectionWarningType = 0;
    platform::Atomic<Text> _defaultDhcpClientID; // never set
    [[maybe_unused]] platform::Atomic<Text>
        _defaultIP4ConfigurationMethod; // the property asks the store instead
};

// How a manager looks in a message.
inline std::string describe(const NetworkingManager&) {
    return "<NetworkingManager>";
}

} // namespace welcomer
