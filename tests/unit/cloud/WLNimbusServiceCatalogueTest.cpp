#include "cloud/WLNimbusServiceCatalogue.h"

#include "platform/AccountService.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <set>
#include <string>
#include <vector>

namespace welcomer {
namespace {

using namespace platform;
using Strings = std::vector<std::string>;

TEST(WLNimbusServiceCatalogueTest, TheSyncServicesInTheirOrder) {
    EXPECT_EQ(WLNimbusSyncServiceIDs(),
              (Strings{kSKServiceIDContacts, kSKServiceIDCalendars, kSKServiceIDBookMarks,
                       kSKServiceIDMediaStream, kSKServiceIDReminders, kSKServiceIDAccountSync}));
}

TEST(WLNimbusServiceCatalogueTest, AllServicesAreTheSyncServicesThenLocatorMailNotesDocuments) {
    EXPECT_EQ(WLNimbusAllSetupServiceIDs(),
              (Strings{kSKServiceIDContacts, kSKServiceIDCalendars, kSKServiceIDBookMarks,
                       kSKServiceIDMediaStream, kSKServiceIDReminders, kSKServiceIDAccountSync,
                       kSKServiceIDLOC, kSKServiceIDMail, kSKServiceIDNotes, kSKServiceMobileDocuments}));
}

TEST(WLNimbusServiceCatalogueTest, ThePostLoginServices) {
    EXPECT_EQ(WLNimbusPostLoginServiceIDs(),
              (Strings{kSKServiceIDBookMarks, kSKServiceIDMail, kSKServiceIDNotes, kSKServiceIDContacts,
                       kSKServiceIDReminders, kSKServiceIDCalendars}));
}

TEST(WLNimbusServiceCatalogueTest, TheDelayedServicesAreCalendarsAndReminders) {
    EXPECT_EQ(WLNimbusDelayedServiceIDs(), (Strings{kSKServiceIDCalendars, kSKServiceIDReminders}));
}

TEST(WLNimbusServiceCatalogueTest, EveryIdentifierIsAReverseDomainStringOfItsOwn) {
    const Strings all = WLNimbusAllSetupServiceIDs();
    EXPECT_EQ(std::set<std::string>(all.begin(), all.end()).size(), 10U);
    for (const std::string& identifier : all) {
        EXPECT_TRUE(identifier.starts_with("com.corvid.")) << identifier;
    }
    const std::set<std::string> keys{kSKPropertyAccountID, kSKPropertyMailEmailAddress,
                                     kSKPropertyAccountError, kSKPropertyAccountErrorInfo};
    EXPECT_EQ(keys.size(), 4U);
}

} // namespace
} // namespace welcomer
