#include "backends/local/network/NetworkFile.h"

#include "backends/local/DictionaryFile.h"
#include "backends/posix/Directory.h"
#include "platform/NetworkConfigStore.h"
#include "platform/Path.h"

#include <cerrno>

namespace welcomer::local {

namespace {

using Dictionary = PropertyList::Dictionary;

constexpr char kFolder[] = "/var/lib/welcomer";
constexpr char kFileName[] = "network.plist";
constexpr mode_t kFolderMode = 0755; // everybody may read it
constexpr mode_t kFileMode = 0644;

constexpr char kCurrentSet[] = "CurrentSet";
constexpr char kSets[] = "Sets";
constexpr char kServices[] = "Services";
constexpr char kName[] = "Name";
constexpr char kDevice[] = "Device";
constexpr char kEnabled[] = "Enabled";
constexpr char kProtocols[] = "Protocols";
constexpr char kConfiguration[] = "Configuration";
constexpr char kAutomaticSet[] = "automatic";

// The dictionary under a key, which is made where there is none.
Dictionary& dictionaryIn(Dictionary& content, const std::string& key) {
    PropertyList& value = content[key];
    if (!value.isDictionary()) {
        value = Dictionary();
    }
    return *value.dictionary();
}

const PropertyList* valueIn(const Dictionary& content, const std::string& key) {
    const auto found = content.find(key);
    return found == content.end() ? nullptr : &found->second;
}

const PropertyList* serviceIn(const Dictionary& content, const std::string& serviceID) {
    const PropertyList* services = valueIn(content, kServices);
    return services ? services->find(serviceID) : nullptr;
}

Dictionary* changedService(Dictionary& content, const std::string& serviceID) {
    return serviceIn(content, serviceID) ? &dictionaryIn(dictionaryIn(content, kServices), serviceID)
                                         : nullptr;
}

std::string currentSet(const Dictionary& content) {
    const PropertyList* name = valueIn(content, kCurrentSet);
    return name && name->string() ? *name->string() : kAutomaticSet;
}

// Adds a service of a device that has none to the set in use.
void addService(Dictionary& content, const networkfile::NewService& service) {
    std::string serviceID = service.device;
    for (int number = 2; serviceIn(content, serviceID); ++number) {
        serviceID = service.device + "-" + std::to_string(number);
    }
    dictionaryIn(content, kServices)[serviceID] = Dictionary{
        {kName, service.name},
        {kDevice, service.device},
        {kEnabled, true},
        {kProtocols, Dictionary{{platform::kNetworkProtocolDNS, Dictionary()},
                                {platform::kNetworkProtocolIPv4,
                                 Dictionary{{kConfiguration, Dictionary{{platform::kNetworkConfigMethod,
                                                                         platform::kNetworkMethodDHCP}}}}}}},
    };
    const std::string setID = currentSet(content);
    content[kCurrentSet] = setID;
    Dictionary& set = dictionaryIn(dictionaryIn(content, kSets), setID);
    set.try_emplace(kName, setID);
    PropertyList& list = set[kServices];
    if (!list.isArray()) {
        list = PropertyList::Array();
    }
    list.array()->emplace_back(serviceID);
}

} // namespace

namespace networkfile {

std::optional<std::vector<std::string>> services(const Dictionary& content) {
    const PropertyList* sets = valueIn(content, kSets);
    const PropertyList* set = sets ? sets->find(currentSet(content)) : nullptr;
    if (!set && valueIn(content, kCurrentSet)) {
        return std::nullopt;
    }
    std::vector<std::string> found;
    const PropertyList* list = set ? set->find(kServices) : nullptr;
    for (const PropertyList& each : list && list->array() ? *list->array() : PropertyList::Array()) {
        if (each.string() && serviceIn(content, *each.string())) {
            found.push_back(*each.string());
        }
    }
    return found;
}

const PropertyList* serviceValue(const Dictionary& content, const std::string& serviceID,
                                 const std::string& key) {
    const PropertyList* service = serviceIn(content, serviceID);
    return service ? service->find(key) : nullptr;
}

std::optional<std::string> serviceText(const Dictionary& content, const std::string& serviceID,
                                       const std::string& key) {
    const PropertyList* value = serviceValue(content, serviceID, key);
    return value && value->string() ? std::optional(*value->string()) : std::nullopt;
}

std::optional<std::string> serviceOfDevice(const Dictionary& content, const std::string& device) {
    for (const std::string& serviceID : services(content).value_or(std::vector<std::string>())) {
        if (serviceText(content, serviceID, kDevice) == device) {
            return serviceID;
        }
    }
    return std::nullopt;
}

std::vector<std::string> protocolTypes(const Dictionary& content, const std::string& serviceID) {
    std::vector<std::string> types;
    const PropertyList* protocols = serviceValue(content, serviceID, kProtocols);
    if (protocols && protocols->dictionary()) {
        for (const auto& [type, protocol] : *protocols->dictionary()) {
            types.push_back(type);
        }
    }
    return types;
}

std::optional<Dictionary> configuration(const Dictionary& content, const std::string& serviceID,
                                        const std::string& type) {
    const PropertyList* protocols = serviceValue(content, serviceID, kProtocols);
    const PropertyList* protocol = protocols ? protocols->find(type) : nullptr;
    const PropertyList* value = protocol ? protocol->find(kConfiguration) : nullptr;
    return value && value->dictionary() ? std::optional(*value->dictionary()) : std::nullopt;
}

std::set<std::string> devices(const Dictionary& content) {
    std::set<std::string> found;
    const std::vector<std::string> all = services(content).value_or(std::vector<std::string>());
    for (const std::string& serviceID : all) {
        if (auto device = serviceText(content, serviceID, kDevice)) {
            found.insert(std::move(*device));
        }
    }
    return found;
}

void addServices(Dictionary& content, const std::vector<NewService>& added) {
    std::set<std::string> known = devices(content);
    for (const NewService& service : added) {
        if (known.insert(service.device).second) { // otherwise somebody else was first
            addService(content, service);
        }
    }
}

void setEnabled(Dictionary& content, const std::string& serviceID, bool enabled) {
    if (Dictionary* service = changedService(content, serviceID)) {
        (*service)[kEnabled] = enabled;
    }
}

void addProtocol(Dictionary& content, const std::string& serviceID, const std::string& type) {
    if (Dictionary* service = changedService(content, serviceID)) {
        dictionaryIn(dictionaryIn(*service, kProtocols), type);
    }
}

void setConfiguration(Dictionary& content, const std::string& serviceID, const std::string& type,
                      const Dictionary& configuration) {
    if (Dictionary* service = changedService(content, serviceID)) {
        dictionaryIn(dictionaryIn(*service, kProtocols), type)[kConfiguration] = configuration;
    }
}

} // namespace networkfile

Dictionary NetworkFile::read() const {
    return readDictionaryFile(_root, platform::joinPath(kFolder, kFileName)).values;
}

std::int32_t NetworkFile::change(const std::vector<std::function<void(Dictionary&)>>& changes,
                                 Dictionary& content, platform::Error& error) const {
    posix::makeDirectories(_root, kFolder, kFolderMode);
    LockedDictionaryFolder folder(_root, kFolder, posix::machineLockPath(posix::kMachineFilesLock),
                                  kFolderMode, kFileMode);
    if (!folder) {
        error = folder.error();
        return error.number == ETIMEDOUT ? platform::kNetworkConfigInUse
                                         : platform::kNetworkConfigWriteFailed;
    }
    const std::string path = platform::joinPath(kFolder, kFileName);
    DictionaryFileContent onDisk = readDictionaryFile(_root, path);
    if (onDisk.state == DictionaryFileContent::State::Unreadable) {
        error = {0, "cannot read " + _root.shown(path) + ": " + onDisk.reason};
        return platform::kNetworkConfigReadFailed;
    }
    if (onDisk.state == DictionaryFileContent::State::Damaged &&
        folder.setAside(kFileName, onDisk.bytes).empty()) {
        error = folder.error();
        return platform::kNetworkConfigWriteFailed;
    }
    Dictionary changed = onDisk.values;
    for (const auto& change : changes) {
        change(changed);
    }
    if (changed != onDisk.values && !folder.write(kFileName, changed)) {
        error = folder.error();
        return platform::kNetworkConfigWriteFailed;
    }
    content = std::move(changed);
    return platform::kNetworkConfigSuccess;
}

} // namespace welcomer::local
