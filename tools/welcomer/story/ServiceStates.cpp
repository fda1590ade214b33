#include "tools/welcomer/story/ServiceStates.h"

#include "cloud/WLNimbusServiceCatalogue.h"
#include "platform/Platform.h"
#include "tools/welcomer/terminal/Failure.h"
#include "tools/welcomer/terminal/TextTable.h"

#include <algorithm>
#include <map>
#include <ostream>

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

const char* yesOrNo(bool value) {
    return value ? "yes" : "no";
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

void printServiceStates(std::ostream& out, const std::vector<ServiceState>& states,
                        const std::string& indent) {
    TextTable table({"SERVICE", "PHASE", "PRESENT", "CAN BE ENABLED", "ENABLED"});
    for (const ServiceState& state : states) {
        table.addRow({state.entry.name, state.entry.phase(), yesOrNo(state.isPresent),
                      yesOrNo(state.canBeEnabled), yesOrNo(state.isEnabled)});
    }
    table.print(out, indent);
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
