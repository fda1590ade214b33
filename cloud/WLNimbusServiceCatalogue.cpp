#include "cloud/WLNimbusServiceCatalogue.h"

#include "platform/AccountService.h"

#include <iterator>

namespace welcomer {

std::vector<std::string> WLNimbusSyncServiceIDs() {
    return {platform::kSKServiceIDContacts,  platform::kSKServiceIDCalendars,
            platform::kSKServiceIDBookMarks, platform::kSKServiceIDMediaStream,
            platform::kSKServiceIDReminders, platform::kSKServiceIDAccountSync};
}

std::vector<std::string> WLNimbusAllSetupServiceIDs() {
    return {std::begin(platform::kSKServiceIDs), std::end(platform::kSKServiceIDs)};
}

std::vector<std::string> WLNimbusPostLoginServiceIDs() {
    return {platform::kSKServiceIDBookMarks, platform::kSKServiceIDMail,
            platform::kSKServiceIDNotes,     platform::kSKServiceIDContacts,
            platform::kSKServiceIDReminders, platform::kSKServiceIDCalendars};
}

std::vector<std::string> WLNimbusDelayedServiceIDs() {
    return {platform::kSKServiceIDCalendars, platform::kSKServiceIDReminders};
}

} // namespace welcomer
