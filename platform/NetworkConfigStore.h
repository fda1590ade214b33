// The persistent network configuration: sets of services, each with an interface and protocols.

#pragma once

#include "propertylist/PropertyList.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::platform {

// The types of interfaces. A wireless interface's type is kNetworkWireless, which is the hardware key of
// wireless services; a store may also tell kNetworkIEEE80211, which means the same port.
inline constexpr char kNetworkEthernet[] = "Ethernet";
inline constexpr char kNetworkWireless[] = "Wireless";
inline constexpr char kNetworkIEEE80211[] = "IEEE80211";
inline constexpr char kNetworkBridge[] = "Bridge";
inline constexpr char kNetworkBond[] = "Bond";
inline constexpr char kNetworkVLAN[] = "VLAN";

// The types of protocols.
inline constexpr char kNetworkProtocolIPv4[] = "IPv4";
inline constexpr char kNetworkProtocolDNS[] = "DNS";

// The names in an IPv4 configuration: texts but for the lists of texts "Addresses" and "SubnetMasks".
inline constexpr char kNetworkConfigMethod[] = "ConfigMethod";
inline constexpr char kNetworkAddresses[] = "Addresses";
inline constexpr char kNetworkSubnetMasks[] = "SubnetMasks";
inline constexpr char kNetworkRouter[] = "Router";
inline constexpr char kNetworkDHCPClientID[] = "DHCPClientID";

// The names in a DNS configuration: a list of texts, and a text.
inline constexpr char kNetworkServerAddresses[] = "ServerAddresses";
inline constexpr char kNetworkDomainName[] = "DomainName";

// The values of "ConfigMethod".
inline constexpr char kNetworkMethodManual[] = "Manual";
inline constexpr char kNetworkMethodInform[] = "INFORM";
inline constexpr char kNetworkMethodDHCP[] = "DHCP";
inline constexpr char kNetworkMethodBootP[] = "BOOTP";
inline constexpr char kNetworkMethodLinkLocal[] = "LinkLocal";

// The store's error codes. Their numbers are this system's own; they appear in log lines.
enum NetworkConfigStatus : std::int32_t {
    kNetworkConfigSuccess = 0,
    kNetworkConfigAccessDenied = 1,           // the caller lacks the rights to change the network
    kNetworkConfigNotFound = 2,               // the set, the service or the protocol is not there any more
    kNetworkConfigAlreadyThere = 3,           // the service has a protocol of that type
    kNetworkConfigReadFailed = 4,             // the stored configuration cannot be read
    kNetworkConfigWriteFailed = 5,            // nor written
    kNetworkConfigNoDevice = 6,               // the machine has no such network device now
    kNetworkConfigInvalid = 7,                // an address, a mask or a name server is missing or none
    kNetworkConfigUnknownMethod = 8,          // a configuration method that means nothing here
    kNetworkConfigNoDHCPClient = 9,           // the machine has no DHCP client that could be started
    kNetworkConfigDHCPClientFailed = 10,      // it could not be started
    kNetworkConfigNameServersElsewhere = 11,  // another program decides about the name servers
    kNetworkConfigNameServersNotWritten = 12, // the system refused to store them
    kNetworkConfigNotActivated = 13,          // the machine's network service could not put it to use
    kNetworkConfigInUse = 14, // another process holds what is stored, and did not let go of it in time
    kNetworkConfigNameServiceSilent = 15, // the program that decides about the name servers does not answer
    kNetworkConfigKernelRefused = 1000,   // and above: the kernel refused, with its error number added
};

// The text of a code, for people. Any thread.
std::string networkConfigStatusText(std::int32_t status);

// One interface, and what it stands on: a bridge on a port, a VLAN on a link. All are as they were when the
// service or the list that they belong to was asked for. Any thread.
class NetworkInterface {
  public:
    virtual ~NetworkInterface() = default;

    // One of the types above, or another text; none when the store does not know.
    virtual std::optional<std::string> type() const = 0;

    // The kernel's name of the device.
    virtual std::optional<std::string> deviceName() const = 0;

    // A name for people.
    virtual std::optional<std::string> displayName() const = 0;

    // The interface below this one, or null. Borrowed: lives as long as this one.
    virtual NetworkInterface* underlyingInterface() const = 0;
};

// A connection to the store, and whatever was got through it. One thread at a time for each connection with
// its handles.
class NetworkConfigHandle {
  public:
    virtual ~NetworkConfigHandle() = default;

    // The code of the last operation on the connection or on any of its handles, 0 when that succeeded, and
    // its text for people, which also names what it was about where the store knows.
    virtual std::int32_t lastErrorCode() const = 0;
    virtual std::string lastErrorText() const = 0;
};

// One protocol of a service. Changes are seen through the same connection at once, by others once they are
// committed.
class NetworkProtocol : public NetworkConfigHandle {
  public:
    virtual std::optional<std::string> type() = 0;

    // A copy, or none when the protocol has no configuration.
    virtual std::optional<PropertyList::Dictionary> configuration() = 0;

    // Replaces the configuration, whatever it holds: it is checked when it is committed.
    //  result  false: the last error says why
    virtual bool setConfiguration(const PropertyList::Dictionary& configuration) = 0;
};

class NetworkService : public NetworkConfigHandle {
  public:
    // The user-visible name.
    virtual std::optional<std::string> name() = 0;

    virtual std::optional<std::string> serviceID() = 0;

    // The outermost interface, or null. Borrowed: lives as long as this service.
    virtual NetworkInterface* interface() = 0;

    // Whether the service is to be used.
    //  result  false: the last error says why
    virtual bool setEnabled(bool enabled) = 0;

    // The service's protocol of a type, or null.
    virtual std::shared_ptr<NetworkProtocol> copyProtocol(const std::string& type) = 0;

    // Adds a protocol without a configuration.
    //  result  false, also when the service has one of that type: the last error says why
    virtual bool addProtocolType(const std::string& type) = 0;

    // All protocols, none when they cannot be listed; an entry may be null.
    virtual std::optional<std::vector<std::shared_ptr<NetworkProtocol>>> copyProtocols() = 0;
};

class NetworkSet : public NetworkConfigHandle {
  public:
    // The services in the set's order, none when they cannot be listed. One whose device is a port of a
    // bridge or a bond by now is passed over: the bridge or bond has a service of its own.
    virtual std::optional<std::vector<std::shared_ptr<NetworkService>>> copyServices() = 0;

    // Adds a service with default protocols for every piece of network hardware that has none in this set.
    //  result  whether anything was added; when not, the last error says whether that was a failure
    virtual bool establishDefaultConfiguration() = 0;
};

// A connection sees what was stored when it was opened or last synchronised, with its own changes. Its
// handles keep it alive.
class NetworkConfigConnection : public NetworkConfigHandle {
  public:
    // The set in use, or null when the machine has none yet.
    virtual std::shared_ptr<NetworkSet> copyCurrentSet() = 0;

    // Stores the changes made through this connection, all or nothing; takes the rights that the platform
    // demands. A configuration that could not be applied is refused, and nothing is stored then.
    //  result  false: the last error says why
    virtual bool commitChanges() = 0;

    // Has the machine use what this connection has committed. May take seconds.
    //  result  false: the last error says why; what of it is in use then is the platform's matter
    virtual bool applyChanges() = 0;

    // Drops the changes that are not committed, and sees what others have stored.
    virtual void synchronize() = 0;
};

// Any thread.
class NetworkConfigStore {
  public:
    virtual ~NetworkConfigStore() = default;

    // Opens a connection under a name, which is for people who look for the origin of a change.
    //  result  never null; what cannot be read shows when it is used
    // May read files and ask the kernel.
    virtual std::shared_ptr<NetworkConfigConnection> open(const std::string& name) = 0;

    // All interfaces of the machine but the loopback, in the platform's order; an entry may be null. Asks
    // the kernel.
    virtual std::vector<std::shared_ptr<NetworkInterface>> copyInterfaces() = 0;
};

} // namespace welcomer::platform
