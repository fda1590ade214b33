#include "tools/welcomer/story/ServiceStates.h"

#include "tests/fakes/FakePlatform.h"
#include "tools/welcomer/cli/Tool.h"

#include <gtest/gtest.h>
#include <set>

namespace welcomer::tool {
namespace {

TEST(ServiceCatalogue, EveryServiceHasAShortNameOfItsOwn) {
    std::set<std::string> names;
    for (const CatalogueEntry& entry : serviceCatalogue()) {
        EXPECT_NE(entry.name, entry.identifier);
        names.insert(entry.name);
    }
    EXPECT_EQ(names.size(), 10U);
}

TEST(ServiceCatalogue, AServiceIsMeantByItsNameOrIdentifier) {
    for (const CatalogueEntry& entry : serviceCatalogue()) {
        EXPECT_EQ(serviceNamed(entry.name), entry.identifier);
        EXPECT_EQ(serviceNamed(entry.identifier), entry.identifier);
    }
    EXPECT_THROW(serviceNamed("Mail"), UsageError);
    EXPECT_THROW(serviceNamed(""), UsageError);
}

TEST(ServiceStates, AnAccountThatDoesNotExistHasNoService) {
    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed(fake.platform());
    for (const ServiceState& state : serviceStates(nullptr)) {
        EXPECT_FALSE(state.isPresent || state.canBeEnabled || state.isEnabled);
    }
}

TEST(ServiceStates, EachServiceHasItsOwnState) {
    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed(fake.platform());
    fake.accountService.accounts["anna"] = {{platform::kSKServiceIDMail, {true, true, {}}},
                                            {platform::kSKServiceIDNotes, {false, false, {}}}};
    const auto account = fake.accountService.accountForID("anna", false);
    const std::vector<ServiceState> states = serviceStates(account.get());
    for (const ServiceState& state : states) {
        const bool isMail = state.entry.name == "mail";
        EXPECT_EQ(state.isPresent, isMail || state.entry.name == "notes") << state.entry.name;
        EXPECT_EQ(state.canBeEnabled, isMail) << state.entry.name;
        EXPECT_EQ(state.isEnabled, isMail) << state.entry.name;
    }
    EXPECT_EQ(enabledServices(states), std::vector<std::string>{platform::kSKServiceIDMail});
}

} // namespace
} // namespace welcomer::tool
