// The services of the cloud account as the tool names and shows them.

#pragma once

#include "platform/AccountService.h"
#include "tools/welcomer/cli/Report.h"

#include <string>
#include <vector>

namespace welcomer::tool {

// What the catalogue says of one service.
struct CatalogueEntry {
    std::string identifier;
    std::string name; // short, for people: "photo-stream"
    bool isPostLogin = false;
    bool isDelayed = false; // in the post-login phase

    const char* phase() const { return isPostLogin ? "post-login" : "pre-login"; }
};

// Every service that setup may enable, in the catalogue's order.
std::vector<CatalogueEntry> serviceCatalogue();

// The service that a user means by its identifier or its short name.
//  result  its identifier
// Throws UsageError for what is neither.
std::string serviceNamed(const std::string& name);

// The short name of a service; the identifier itself for one that is not in the catalogue.
std::string serviceName(const std::string& identifier);

// One service of an account.
struct ServiceState {
    CatalogueEntry entry;
    bool isPresent = false;
    bool canBeEnabled = false;
    bool isEnabled = false;
};

// The state of every service in the catalogue.
//  account  may be null: an account that does not exist has no service
std::vector<ServiceState> serviceStates(platform::CloudAccount* account);

// An array with an object for each.
Json toJson(const std::vector<ServiceState>& states);

// Shows such an array to people.
void addServiceTable(Report& report, const Json& services, const std::string& indent = "");

// The identifiers of the enabled ones.
std::vector<std::string> enabledServices(const std::vector<ServiceState>& states);

} // namespace welcomer::tool
