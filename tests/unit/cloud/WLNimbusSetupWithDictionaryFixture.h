// What the tests of enabling an account's services share.

#pragma once

#include "cloud/WLNimbusServiceCatalogue.h"
#include "cloud/WLNimbusSetupWithDictionary.h"
#include "tests/fakes/FakePlatform.h"

#include <algorithm>
#include <chrono>
#include <gtest/gtest.h>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {

using namespace platform;
using namespace std::chrono_literals;
using Strings = std::vector<std::string>;
using Dictionary = PropertyList::Dictionary;
using Services = fakes::FakeAccountService::Services;

inline const Dictionary kAnna{{kSKPropertyAccountID, "anna"}};
inline const Strings kAllServices = WLNimbusAllSetupServiceIDs();
inline const std::string kLog = "SystemLog.write 115, ";

// What a test looks at, with an account that has every service and a mail address.
struct World {
    World() {
        for (const std::string& identifier : kAllServices) {
            services()[identifier] = {};
        }
        setMailAddress("anna@example.org");
    }

    Services& services() { return fake.accountService.accounts["anna"]; }
    fakes::FakeAccountService::ServiceState& service(const std::string& identifier) {
        return services()[identifier];
    }
    void setMailAddress(const std::optional<PropertyList>& address) {
        Dictionary& properties = service(kSKServiceIDMail).properties;
        properties.clear();
        if (address) {
            properties[kSKPropertyMailEmailAddress] = *address;
        }
    }
    void setDelay(const PropertyList& value) {
        fake.preferenceStore.store("com.corvid.welcomer", "WLDebugPostLoginDelay", value);
    }

    // The services that are enabled, in the catalogue's order.
    Strings enabled() {
        Strings result;
        for (const std::string& identifier : kAllServices) {
            if (service(identifier).enabled) {
                result.push_back(identifier);
            }
        }
        return result;
    }
    Strings lines() const { return fake.systemLog.lines(); }
    bool hasLine(const std::string& line) const {
        const Strings all = lines();
        return std::find(all.begin(), all.end(), line) != all.end();
    }

    fakes::FakePlatform fake;
    const ScopedPlatform installed{fake.platform()};
};

class WLNimbusSetupWithDictionaryTest : public testing::Test, protected World {
  protected:
    bool setUp(bool postLogin, const Strings& selected = kAllServices,
               const std::shared_ptr<Window>& window = nullptr, bool kvsOnly = false) {
        return WLNimbusSetupWithDictionary2(kAnna, selected, kvsOnly, postLogin, window, nullptr);
    }
    static Strings allBut(const std::string& identifier) {
        Strings selected = kAllServices;
        std::erase(selected, identifier);
        return selected;
    }
};

} // namespace welcomer
