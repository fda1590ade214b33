#include "network/NCUtils.h"

#include "log/PCLogManager.h"

#include <algorithm>

namespace welcomer {

namespace {

constexpr char kCreateFunction[] = "+[NCUtils createOrGetProtocol:forService:]";
constexpr char kCopyFunction[] = "+[NCUtils copyProtocolsFromService:toService:]";

std::optional<NCUtils::Services> servicesOf(platform::NetworkSet* set) {
    return set ? set->copyServices() : std::nullopt;
}

} // namespace

std::shared_ptr<platform::NetworkService>
NCUtils::serviceInSetWithName(platform::NetworkSet* set, const std::optional<std::string>& name) {
    if (!name || name->empty()) {
        return nullptr;
    }
    const Services services = servicesOf(set).value_or(Services());
    const auto found = std::ranges::find_if(
        services, [&](const auto& service) { return service && service->name() == name; });
    return found == services.end() ? nullptr : *found;
}

std::optional<NCUtils::Services>
NCUtils::servicesInSetWithHardwareKey(platform::NetworkSet* set,
                                      const std::optional<std::string>& hardwareKey) {
    if (!hardwareKey || hardwareKey->empty()) {
        return std::nullopt;
    }
    std::optional<Services> services = servicesOf(set);
    if (services) {
        std::erase_if(*services, [&](const auto& service) {
            return !interfaceInServiceWithType(service.get(), *hardwareKey);
        });
    }
    return services;
}

std::shared_ptr<platform::NetworkService>
NCUtils::serviceInSetWithHardwareKey(platform::NetworkSet* set,
                                     const std::optional<std::string>& hardwareKey) {
    const std::optional<Services> services = servicesInSetWithHardwareKey(set, hardwareKey);
    return services && !services->empty() ? services->front() : nullptr;
}

platform::NetworkService* NCUtils::serviceInArrayWithID(const std::optional<Services>& services,
                                                        const std::optional<std::string>& serviceID) {
    if (!services || !serviceID || serviceID->empty()) {
        return nullptr;
    }
    const auto found = std::ranges::find_if(
        *services, [&](const auto& service) { return service && service->serviceID() == serviceID; });
    return found == services->end() ? nullptr : found->get();
}

platform::NetworkInterface* NCUtils::interfaceInServiceWithType(platform::NetworkService* service,
                                                                const std::string& type) {
    platform::NetworkInterface* interface = service ? service->interface() : nullptr;
    while (interface && interface->type() != type) {
        interface = interface->underlyingInterface();
    }
    return interface;
}

std::shared_ptr<platform::NetworkProtocol>
NCUtils::createOrGetProtocolForService(const std::string& type, platform::NetworkService* service) {
    if (!service) {
        return nullptr;
    }
    if (std::shared_ptr<platform::NetworkProtocol> protocol = service->copyProtocol(type)) {
        return protocol;
    }
    if (service->addProtocolType(type)) {
        return service->copyProtocol(type);
    }
    const long error = service->lastErrorCode();
    WL_LOG_AS(kCreateFunction, "Error %ld from NCNetworkServiceAddProtocolType", error);
    return nullptr;
}

void NCUtils::copyProtocolsFromServiceToService(platform::NetworkService* source,
                                                platform::NetworkService* destination) {
    if (!source || !destination) {
        return;
    }
    using Protocols = std::vector<std::shared_ptr<platform::NetworkProtocol>>;
    for (const auto& protocol : source->copyProtocols().value_or(Protocols())) {
        const std::optional<std::string> type = protocol ? protocol->type() : std::nullopt;
        if (!type || type->empty()) {
            continue;
        }
        if (!destination->addProtocolType(*type)) {
            WL_LOG_AS(kCopyFunction, "Could not create protocol of type %@", *type);
            continue;
        }
        const std::optional<PropertyList::Dictionary> configuration = protocol->configuration();
        if (!configuration) {
            continue;
        }
        const std::shared_ptr<platform::NetworkProtocol> added = destination->copyProtocol(*type);
        if (!added || !added->setConfiguration(*configuration)) {
            WL_LOG_AS(kCopyFunction, "Could not set protocol configuration");
        }
    }
}

} // namespace welcomer
