#include "tools/welcomer/story/ServiceStates.h"

#include "cloud/WLNimbusServiceCatalogue.h"
#include "platform/Platform.h"
#include "tools/welcomer/terminal/Failure.h"

#include <algorithm>
#include <map>

namespace welcomer::tool {

namespace {

const std::map<std::string, std::string>& shortNames() {
    static const std::map<std::string, std::string> names{
        {platform::kSKServiceIDContacts, "contacts"},   {platform::kSKServiceIDCalendars, "calendars"},
        {platform::kSKServiceIDBookMarks, "bookmarks"}, {platform::kSKServiceIDMediaStream, "photo-stream"},
        {platform::kSKServiceIDReminders, "reminders"}, {platform::kSKServiceIDAccountSync, "account-sync"},
        {platform::kSKServiceIDLOC, "locator"},         {platform::kSKServiceIDMail, "mail"},
        {platform::kSKServiceIDNotes, "notes"},         {platform::kSKServiceMobileDocuments, "documents"},
    };
    return names;
}

bool contains(const std::vector<std::string>& identifiers, const std::string& identifier) {
    return std::ranges::find(identifiers, identifier) != identifiers.end();
}

} // namespace

std::vector<CatalogueEntry> serviceCatalogue() {
    std::vector<CatalogueEntry> entries;
    for (const std::string& identifier : WLNimbusAllSetupServiceIDs()) {
        entries.push_back({identifier, serviceName(identifier),
                           contains(WLNimbusPostLoginServiceIDs(), identifier),
                           contains(WLNimbusDelayedServiceIDs(), identifier)});
    }
    return entries;
}

std::string serviceNamed(const std::string& name) {
    for (const CatalogueEntry& entry : serviceCatalogue()) {
        if (name == entry.identifier || name == entry.name) {
            return entry.identifier;
        }
    }
    throw UsageError("there is no service " + name);
}

std::string serviceName(const std::string& identifier) {
    const auto found = shortNames().find(identifier);
    return found == shortNames().end() ? identifier : found->second;
}

std::vector<ServiceState> serviceStates(platform::CloudAccount* account) {
    std::vector<ServiceState> states;
    for (const CatalogueEntry& entry : serviceCatalogue()) {
        const auto service = account ? account->serviceForID(entry.identifier) : nullptr;
        states.push_back({entry, service != nullptr, service && service->canBeEnabled(),
                          platform::current().accountService.isServiceEnabled(account, entry.identifier)});
    }
    return states;
}

Json toJson(const std::vector<ServiceState>& states) {
    Json services = Json::array();
    for (const ServiceState& state : states) {
        services.push_back({{"service", state.entry.name},
                            {"identifier", state.entry.identifier},
                            {"phase", state.entry.phase()},
                            {"present", state.isPresent},
                            {"canBeEnabled", state.canBeEnabled},
                            {"enabled", state.isEnabled}});
    }
    return services;
}

void addServiceTable(Report& report, const Json& services, const std::string& indent) {
    report.table(services,
                 {{"SERVICE", "service"},
                  {"PHASE", "phase"},
                  {"PRESENT", "present"},
                  {"CAN BE ENABLED", "canBeEnabled"},
                  {"ENABLED", "enabled"}},
                 indent);
}

std::vector<std::string> enabledServices(const std::vector<ServiceState>& states) {
    std::vector<std::string> identifiers;
    for (const ServiceState& state : states) {
        if (state.isEnabled) {
            identifiers.push_back(state.entry.identifier);
        }
    }
    return identifiers;
}

} // namespace welcomer::tool
