// The file that holds the persistent network configuration.

#pragma once

#include "backends/posix/RootFolder.h"
#include "platform/Error.h"
#include "propertylist/PropertyList.h"

#include <cstdint>
#include <functional>
#include <optional>
#include <set>
#include <string>
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

// A service that is to be added.
struct NewService {
    std::string device;
    std::string name;
};

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

// The types of a service's protocols.
std::vector<std::string> protocolTypes(const PropertyList::Dictionary& content, const std::string& serviceID);

// A protocol's configuration, or none.
std::optional<PropertyList::Dictionary> configuration(const PropertyList::Dictionary& content,
                                                      const std::string& serviceID, const std::string& type);

// Changes. Those of a service that is not there change nothing.
// A device that has a service keeps it.
void addServices(PropertyList::Dictionary& content, const std::vector<NewService>& added);
void setEnabled(PropertyList::Dictionary& content, const std::string& serviceID, bool enabled);
void addProtocol(PropertyList::Dictionary& content, const std::string& serviceID, const std::string& type);
void setConfiguration(PropertyList::Dictionary& content, const std::string& serviceID,
                      const std::string& type, const PropertyList::Dictionary& configuration);

} // namespace networkfile

// The file itself. A change takes the lock of the folder's files (FileLock.h), merges into what is on disk
// and replaces the file in one step. A damaged file counts as empty and is set aside before the first change.
// Any thread and any process.
class NetworkFile {
  public:
    explicit NetworkFile(posix::RootFolder root) : _root(std::move(root)) {}

    // Everything in the file; empty when there is nothing that can be read.
    PropertyList::Dictionary read() const;

    // Makes changes to what is on disk.
    //  content  receives what the file holds now, on success
    //  error    receives what failed, with the path and the reason, otherwise
    //  result   0 or a NetworkConfigStatus
    std::int32_t change(const std::vector<std::function<void(PropertyList::Dictionary&)>>& changes,
                        PropertyList::Dictionary& content, platform::Error& error) const;

  private:
    const posix::RootFolder _root;
};

} // namespace welcomer::local
