// The file that holds the persistent network configuration.

#pragma once

#include "backends/network/StoredConfiguration.h"
#include "backends/posix/RootFolder.h"
#include "propertylist/PropertyList.h"

#include <functional>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

namespace welcomer::local {

// What is in the file "/var/lib/welcomer/network.plist" (0644), an XML property list:
//     CurrentSet  the ID of the set in use; without it the machine uses the set "automatic"
//     Sets        a dictionary from ID to set; each set has
//         Name        for people
//         Services    the IDs of its services, in order
//     Services    a dictionary from ID to service; each service has
//         Name        for people
//         Device      the kernel's name of its outermost interface
//         Enabled     boolean
//         Protocols   a dictionary from type to protocol, each with a dictionary "Configuration" or without
// What is missing or of a wrong type counts as empty. These functions work on the content alone. Any thread.
namespace networkfile {

// The services of the set in use, in order; none when the file names a set that it does not have.
std::optional<std::vector<std::string>> services(const PropertyList::Dictionary& content);

// A value of a service, or null. Borrowed from the content.
const PropertyList* serviceValue(const PropertyList::Dictionary& content, const std::string& serviceID,
                                 const std::string& key);
std::optional<std::string> serviceText(const PropertyList::Dictionary& content, const std::string& serviceID,
                                       const std::string& key);

// The service of the set in use with this device, or none.
std::optional<std::string> serviceOfDevice(const PropertyList::Dictionary& content,
                                           const std::string& device);

// The devices that have a service in the set in use.
std::set<std::string> devices(const PropertyList::Dictionary& content);

// A protocol's configuration, or none.
std::optional<PropertyList::Dictionary> configuration(const PropertyList::Dictionary& content,
                                                      const std::string& serviceID, const std::string& type);

// All of a service's protocols.
network::Protocols protocols(const PropertyList::Dictionary& content, const std::string& serviceID);

bool hasService(const PropertyList::Dictionary& content, const std::string& serviceID);

// The ID that a service of a device would be given.
std::string newServiceID(const PropertyList::Dictionary& content, const std::string& device);

// Adds a service of a device that has none to the set in use, enabled, with default protocols.
//  result  its ID
std::string addService(PropertyList::Dictionary& content, const std::string& device, const std::string& name);

// Changes of a service that is there.
void setEnabled(PropertyList::Dictionary& content, const std::string& serviceID, bool enabled);
void setProtocols(PropertyList::Dictionary& content, const std::string& serviceID,
                  const network::Protocols& protocols);

} // namespace networkfile

// The file itself. A change takes the lock of the folder's files (FileLock.h), merges into what is on disk
// and replaces the file in one step. A damaged file counts as empty and is set aside before the first change.
// Any thread and any process.
class NetworkFile {
  public:
    explicit NetworkFile(posix::RootFolder root) : _root(std::move(root)) {}

    // Everything in the file; empty when there is nothing that can be read.
    PropertyList::Dictionary read() const;

    // Changes what is on disk.
    //  edit    makes the change; what it refuses is not written
    //  result  where nothing was refused, also what could not be done, with the path and the reason
    network::Outcome change(const std::function<network::Outcome(PropertyList::Dictionary&)>& edit) const;

  private:
    const posix::RootFolder _root;
};

} // namespace welcomer::local
