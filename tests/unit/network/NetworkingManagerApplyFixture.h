// What the tests of applying the user's settings share.

#pragma once

#include "tests/unit/network/NetworkingManagerFixture.h"

namespace welcomer {

inline const std::string kStore = "NetworkConfigStore.";

class ApplyTest : public NetworkingManagerTest {
  protected:
    ApplyTest() {
        fake.resourceBundles.mainBundleTexts = {{"NETWORKING_MANAGER_NO_INTERNET_TITLE", "No internet"},
                                                {"NETWORKING_MANAGER_NO_INTERNET_BODY", "Check the cable."},
                                                {"NETWORKING_MANAGER_GENERIC_ERROR_TITLE", "Not configured"},
                                                {"NETWORKING_MANAGER_GENERIC_ERROR_BODY", "Try again."}};
        store.services = {service("wired", "eth0"), service("spare", "eth1"),
                          service("radio", "wlan0", "Wireless")};
        setLink("eth0", true);
    }

    const Dictionary reachabilityError = {{"title", "No internet"}, {"body", "Check the cable."}};
    const Dictionary configurationError = {{"title", "Not configured"}, {"body", "Try again."}};

    // A manager with a manual configuration of the wired network.
    NetworkingManager& manualManager() {
        NetworkingManager& made = openManager();
        made.setUserChoice("lan");
        made.setConfigurationMethod("Manual");
        made.setIpAddress("192.0.2.7");
        made.setSubnetMask("255.255.255.0");
        made.setRouter("192.0.2.1");
        return made;
    }

    // Applies, with an error dictionary that is untouched on success.
    bool apply(NetworkingManager& made) {
        error = {{"untouched", true}};
        return made.applySettings(&error);
    }

    Dictionary stored(std::size_t index, const std::string& type) {
        const fakes::FakeProtocol* protocol =
            index < store.stored.size() ? store.stored[index].protocol(type) : nullptr;
        return protocol ? protocol->configuration.value_or(Dictionary{{"no", "configuration"}})
                        : Dictionary{{"no", "protocol"}};
    }

    // The calls that write, without their arguments.
    Lines writes() const {
        Lines found;
        for (const std::string& call : storeCalls()) {
            found.push_back(call.substr(kStore.size(), call.find(',') - kStore.size()));
        }
        return found;
    }

    Dictionary error;
    const Dictionary untouched = {{"untouched", true}};
};

} // namespace welcomer
