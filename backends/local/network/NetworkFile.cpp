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

std::string currentSet(const Dictionary& content) {
    const PropertyList* name = valueIn(content, kCurrentSet);
    return name && name->string() ? *name->string() : kAutomaticSet;
}

Dictionary& serviceToChange(Dictionary& content, const std::string& serviceID) {
    return dictionaryIn(dictionaryIn(content, kServices), serviceID);
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

network::Protocols protocols(const Dictionary& content, const std::string& serviceID) {
    network::Protocols found;
    const PropertyList* all = serviceValue(content, serviceID, kProtocols);
    if (all && all->dictionary()) {
        for (const auto& [type, protocol] : *all->dictionary()) {
            found.emplace(type, configuration(content, serviceID, type));
        }
    }
    return found;
}

bool hasService(const Dictionary& content, const std::string& serviceID) {
    return serviceIn(content, serviceID) != nullptr;
}

std::string newServiceID(const Dictionary& content, const std::string& device) {
    std::string serviceID = device;
    for (int number = 2; hasService(content, serviceID); ++number) {
        serviceID = device + "-" + std::to_string(number);
    }
    return serviceID;
}

std::string addService(Dictionary& content, const std::string& device, const std::string& name) {
    std::string serviceID = newServiceID(content, device);
    serviceToChange(content, serviceID) = {{kName, name}, {kDevice, device}, {kEnabled, true}};
    setProtocols(content, serviceID, network::defaultProtocols());
    const std::string setID = currentSet(content);
    content[kCurrentSet] = setID;
    Dictionary& set = dictionaryIn(dictionaryIn(content, kSets), setID);
    set.try_emplace(kName, setID);
    PropertyList& list = set[kServices];
    if (!list.isArray()) {
        list = PropertyList::Array();
    }
    list.array()->emplace_back(serviceID);
    return serviceID;
}

void setEnabled(Dictionary& content, const std::string& serviceID, bool enabled) {
    serviceToChange(content, serviceID)[kEnabled] = enabled;
}

void setProtocols(Dictionary& content, const std::string& serviceID, const network::Protocols& protocols) {
    Dictionary& all = dictionaryIn(serviceToChange(content, serviceID), kProtocols);
    for (const auto& [type, configuration] : protocols) {
        Dictionary& protocol = dictionaryIn(all, type);
        if (configuration) {
            protocol[kConfiguration] = *configuration;
        }
    }
}

} // namespace networkfile

Dictionary NetworkFile::read() const {
    return readDictionaryFile(_root, platform::joinPath(kFolder, kFileName)).values;
}

network::Outcome NetworkFile::change(const std::function<network::Outcome(Dictionary&)>& edit) const {
    posix::makeDirectories(_root, kFolder, kFolderMode);
    LockedDictionaryFolder folder(_root, kFolder, posix::machineLockPath(posix::kMachineFilesLock),
                                  kFolderMode, kFileMode);
    const auto failed = [&folder] {
        const bool isHeld = folder.error().number == ETIMEDOUT;
        return network::Outcome{isHeld ? platform::kNetworkConfigInUse : platform::kNetworkConfigWriteFailed,
                                folder.error().message};
    };
    if (!folder) {
        return failed();
    }
    const std::string path = platform::joinPath(kFolder, kFileName);
    DictionaryFileContent onDisk = readDictionaryFile(_root, path);
    if (onDisk.state == DictionaryFileContent::State::Unreadable) {
        return {platform::kNetworkConfigReadFailed,
                "cannot read " + _root.shown(path) + ": " + onDisk.reason};
    }
    Dictionary changed = onDisk.values;
    if (network::Outcome outcome = edit(changed); !outcome) {
        return outcome;
    }
    const bool isDamaged = onDisk.state == DictionaryFileContent::State::Damaged;
    const bool isSafe = !isDamaged || !folder.setAside(kFileName, onDisk.bytes).empty();
    if (!isSafe || (changed != onDisk.values && !folder.write(kFileName, changed))) {
        return failed();
    }
    return {};
}

} // namespace welcomer::local
