// A stored network configuration: its set, services and protocols, whatever it is stored in.

#pragma once

#include "backends/network/IPv4Configuration.h"
#include "platform/NetworkConfigStore.h"

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

namespace welcomer::network {

// What came of an operation.
struct Outcome {
    std::int32_t status = platform::kNetworkConfigSuccess; // or another NetworkConfigStatus
    std::string detail{};                                  // what it was about, for people; may be empty

    explicit operator bool() const { return status == platform::kNetworkConfigSuccess; }
};

// A service's protocols: from type to the configuration, or none.
using Protocols = std::map<std::string, std::optional<PropertyList::Dictionary>>;

// The protocols of a service that nobody has configured: DHCP.
const Protocols& defaultProtocols();

// One service as it was when it was read, with the changes since.
struct StoredService {
    std::string id;
    std::optional<std::string> name;                       // for people
    std::optional<std::string> device;                     // the kernel's name of its outermost interface
    std::shared_ptr<platform::NetworkInterface> interface; // never null
    Protocols protocols;
    bool isStored = true; // otherwise it is only listed so far, for a piece of hardware that has no service

    std::set<std::string> changedTypes; // of protocols
    std::optional<bool> isEnabled;      // only when it was changed
    bool isEstablished = false;         // whether it is to be stored though nothing of it was changed

    bool isChanged() const { return !changedTypes.empty() || isEnabled || isEstablished; }

    // Whether a protocol was given a configuration since.
    bool isConfigured() const;

    // Puts the changes of the protocols onto what is stored by now, and checks what they ask of a machine
    // then. What is stored and makes no sense is passed over: it must not stand in the way of what does.
    //  stored         replaces the protocols, but for the changes
    //  configuration  receives what they ask for, on success
    Outcome rebase(Protocols stored, IPv4Configuration& configuration);
};

// A service on its way to the store.
struct ChangedService {
    StoredService& service;
    IPv4Configuration configuration; // what it asks of a machine
};

// Where services are stored, and what has a machine use them. One thread at a time.
class Backing {
  public:
    virtual ~Backing() = default;

    // Reads all services in order, each with the interface that it has now; those whose device is a port of a
    // bridge or a bond are left out. At the end are services for the hardware that has none, not stored yet.
    //  result  none when there is no set in use
    virtual std::optional<std::vector<StoredService>> load() = 0;

    // Stores services, all or nothing: rebases each on what is stored of it by now, whose configuration this
    // fills in. A service that was only listed is stored then, under an ID that may be another one.
    //  changed  may be empty, which tells whether the caller may store at all where the store can tell
    virtual Outcome store(std::vector<ChangedService>& changed) = 0;

    // Has the machine use a service.
    virtual Outcome apply(const StoredService& service, const IPv4Configuration& configuration) = 0;
};

// Makes a backing that sees what is stored by now; null when that cannot be had.
using BackingMaker = std::function<std::unique_ptr<Backing>()>;

// Opens a connection to what is stored. It keeps what it has read, and lets changes be made to that;
// synchronising reads through a new backing where one can be had. What could not be applied can be applied
// again.
//  result  null when no backing can be had
std::shared_ptr<platform::NetworkConfigConnection> openStoredConfiguration(BackingMaker make);

} // namespace welcomer::network
