#include "tools/welcomer/story/ExampleSetup.h"

#include "cloud/WLNimbusServiceCatalogue.h"
#include "handoff/ReplayItem.h"
#include "platform/Platform.h"
#include "plugins/DelegateIdentifiers.h"
#include "tools/welcomer/cli/PropertyListOutput.h"
#include "tools/welcomer/story/SetupBundle.h"
#include "tools/welcomer/story/SetupFlow.h"

#include <cstdlib>
#include <random>
#include <sstream>

namespace welcomer::tool {

platform::CloudUser exampleUser(const PropertyList::Dictionary& responses) {
    // The example plug-ins take as long as the response says, so that one sees them work beside one another.
    const auto response = [](double delaySeconds) {
        return PropertyList::Dictionary{{platform::kStatusKey, 0}, {"delaySeconds", delaySeconds}};
    };
    PropertyList::Dictionary vidlink = response(0.8);
    PropertyList::Dictionary chatter = response(0.5);
    vidlink["aliases"] = PropertyList::Array{kExampleAccount, "+1 555 0100"};
    chatter["aliases"] = PropertyList::Array{kExampleAccount};
    std::random_device random;
    std::ostringstream password;
    password << std::hex << random() << random();
    PropertyList::Dictionary delegates{
        {kVidlinkIdentifier, vidlink}, {kChatterIdentifier, chatter}, {kStorefrontIdentifier, response(1.0)}};
    for (const auto& [identifier, given] : responses) {
        delegates.insert_or_assign(identifier, given);
    }
    return {kExampleAccount,
            password.str(),
            kExampleAccount,
            {{platform::kStatusKey, 0}, {platform::kDelegatesKey, delegates}}};
}

ChildLife setupLife(const std::string& password) {
    return [password](const KeptLog& log, const std::function<void(const std::string&)>& tell) {
        try {
            SetupFlow::checkWhoIsLoggedIn(kExampleAccount);
            SetupFlow flow(log, false);
            flow.signIn(kExampleAccount, password);
            ChosenAliases aliases;
            for (const AliasOffer& offer : flow.aliasOffers()) {
                aliases[offer.identifier] = offer.aliases;
            }
            flow.checkHandOver(aliases);
            flow.complete(WLNimbusAllSetupServiceIDs(), false);
            const auto bundle = platform::current().resourceBundles.open(kSetupBundlePath);
            flow.handOver(aliases, *bundle);
            tell(Json{{"aliases", aliases}, {"delegates", flow.delegates()}}.dump());
            return EXIT_SUCCESS;
        } catch (const std::exception& error) {
            tell(Json{{"failure", error.what()}}.dump(-1, ' ', false, Json::error_handler_t::replace));
            return EXIT_FAILURE;
        }
    };
}

} // namespace welcomer::tool
