// What the tests of the remaining delegate setup share.

#pragma once

#include "agent/wlnimbussetup_RemainingDelegateSetup.h"
#include "tests/fakes/FakePlatform.h"
#include "tests/fakes/PluginRegistry.h"
#include "tests/unit/agent/TestDelegate.h"

#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace welcomer {

using namespace std::chrono_literals;
using Lines = std::vector<std::string>;

inline const std::string kSharedQueue = "com.corvid.wlnimbussetup -- com.corvid.vidlink & com.corvid.chatter";

class RemainingDelegateSetupTest : public testing::Test {
  protected:
    TestDelegate& add(const std::string& identifier) {
        auto plugin = std::make_shared<TestDelegate>(identifier);
        plugins.push_back(plugin);
        fakes::fillPluginRegistry(plugins);
        return *plugin;
    }

    // Gives a delegate a cached response.
    void respond(const std::string& identifier, PropertyList response = "response") {
        responses.insert_or_assign(identifier, std::move(response));
    }

    void setUp(const PropertyList& replayObject) {
        wlnimbussetup_RemainingDelegateSetup(replayObject, std::nullopt, group);
    }

    // Sets up with the responses and the other entries.
    void setUp() {
        PropertyList::Dictionary object = others;
        object.try_emplace("delegatesResponseDict", PropertyList::Dictionary{{"delegates", responses}});
        setUp(PropertyList(object));
    }

    void setUpAndFinish() {
        setUp();
        EXPECT_TRUE(group->wait(1h));
    }

    DelegatePluginArray plugins;
    PropertyList::Dictionary responses;
    PropertyList::Dictionary others; // further entries of the replay object
    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
    const std::shared_ptr<platform::WorkGroup> group = fake.virtualTime.createGroup();
};

} // namespace welcomer
