// How the delegates run beside and after one another.

#include "agent/wlnimbussetup_RemainingDelegateSetup.h"
#include "log/PCLogManager.h"
#include "tests/fakes/FakePlatform.h"
#include "tests/fakes/PluginRegistry.h"
#include "tests/unit/agent/RemainingDelegateSetupFixture.h"
#include "tests/unit/agent/TestDelegate.h"

#include <algorithm>
#include <string>
#include <thread>
#include <vector>

namespace welcomer {
namespace {

TEST_F(RemainingDelegateSetupTest, ItReturnsAfterQueueingWithTheGroupEntered) {
    CompletionHandler kept;
    TestDelegate& plugin = add("a");
    plugin.complete = [&](const CompletionHandler& handler) {
        kept = handler;
    };
    respond("a");
    setUp();
    EXPECT_EQ(plugin.calls.size(), 0U);
    EXPECT_EQ(fake.systemLog.lines().back(), "setting up a");
    EXPECT_FALSE(group->wait(1s));
    EXPECT_EQ(plugin.calls.size(), 1U);
    kept(true, std::nullopt);
    EXPECT_TRUE(group->wait(0ns));
}

TEST_F(RemainingDelegateSetupTest, TheSettingUpLineComesBeforeTheStartTimeAndBeforeTheGroupIsEntered) {
    add("a");
    respond("a");
    PCLogManager::sharedManager().setObserver([&](const PCLogManager::Call& call) {
        if (call.message == "setting up a") {
            EXPECT_TRUE(group->wait(0ns));
            fake.virtualTime.sleep(1s);
        }
    });
    setUp();
    PCLogManager::sharedManager().setObserver({});
    EXPECT_TRUE(group->wait(1h));
    EXPECT_EQ(fake.systemLog.lines().back(), "a setup: completed (0.000 seconds)");
}

TEST_F(RemainingDelegateSetupTest, TheSettingUpLineComesAfterTheQueueIsMade) {
    add("a");
    respond("a");
    Lines queuesThen;
    PCLogManager::sharedManager().setObserver([&](const PCLogManager::Call& call) {
        if (call.message == "setting up a") {
            queuesThen = fake.virtualTime.queueNames();
        }
    });
    setUp();
    PCLogManager::sharedManager().setObserver({});
    EXPECT_EQ(queuesThen, (Lines{kSharedQueue, "com.corvid.wlnimbussetup -- a"}));
}

TEST_F(RemainingDelegateSetupTest, TheMessagingDelegatesShareAQueueAndEveryOtherHasItsOwn) {
    for (const char* identifier :
         {"com.corvid.storefront", "com.corvid.vidlink", "com.corvid.chatter", "a"}) {
        add(identifier);
        respond(identifier);
    }
    setUpAndFinish();
    EXPECT_EQ(fake.virtualTime.queueNames(), (Lines{kSharedQueue, "com.corvid.wlnimbussetup -- a",
                                                    "com.corvid.wlnimbussetup -- com.corvid.storefront"}));
}

TEST_F(RemainingDelegateSetupTest, TheMessagingDelegatesNeverRunAtOnceWhileTheOthersRunBeside) {
    Lines events;
    for (const std::string identifier : {"com.corvid.vidlink", "com.corvid.chatter", "a", "b"}) {
        add(identifier).complete = [&, identifier](const CompletionHandler& handler) {
            events.push_back(identifier + " begins");
            fake.virtualTime.sleep(1s);
            events.push_back(identifier + " ends");
            handler(true, std::nullopt);
        };
        respond(identifier);
    }
    setUpAndFinish();
    const auto at = [&](const std::string& event) {
        return std::find(events.begin(), events.end(), event) - events.begin();
    };
    ASSERT_EQ(events.size(), 8U);
    EXPECT_LT(at("com.corvid.chatter ends"), at("com.corvid.vidlink begins"));
    for (const char* begin : {"a begins", "b begins", "com.corvid.chatter begins"}) {
        for (const char* end : {"a ends", "b ends", "com.corvid.chatter ends"}) {
            EXPECT_LT(at(begin), at(end));
        }
    }
}

TEST_F(RemainingDelegateSetupTest, AMessagingDelegateWaitsForTheOthersCallAndNotForItsHandler) {
    CompletionHandler kept;
    add("com.corvid.chatter").complete = [&](const CompletionHandler& handler) {
        kept = handler;
    };
    TestDelegate& vidlink = add("com.corvid.vidlink");
    respond("com.corvid.chatter");
    respond("com.corvid.vidlink");
    setUp();
    EXPECT_FALSE(group->wait(1s));
    EXPECT_EQ(vidlink.calls.size(), 1U);
    kept(true, std::nullopt);
    EXPECT_TRUE(group->wait(0ns));
}

TEST_F(RemainingDelegateSetupTest, ALoneMessagingDelegateIsOnTheSharedQueueToo) {
    for (const char* identifier : {"com.corvid.vidlink", "com.corvid.chatter"}) {
        fakes::FakePlatform own;
        const platform::ScopedPlatform ownInstalled(own.platform());
        const auto ownGroup = own.virtualTime.createGroup();
        const PropertyList replayObject(PropertyList::Dictionary{
            {"delegatesResponseDict",
             PropertyList::Dictionary{{"delegates", PropertyList::Dictionary{{identifier, "response"}}}}}});
        fakes::fillPluginRegistry({std::make_shared<TestDelegate>(identifier)});
        wlnimbussetup_RemainingDelegateSetup(replayObject, std::nullopt, ownGroup);
        EXPECT_TRUE(ownGroup->wait(1h));
        EXPECT_EQ(own.virtualTime.queueNames(), Lines{kSharedQueue});
    }
}

TEST_F(RemainingDelegateSetupTest, SecondsAreCountedFromTheQueueingAlsoWhileTheJobWaitsForAnother) {
    for (const char* identifier : {"com.corvid.chatter", "com.corvid.vidlink"}) {
        add(identifier).complete = [&](const CompletionHandler& handler) {
            fake.virtualTime.sleep(1s);
            handler(true, std::nullopt);
        };
        respond(identifier);
    }
    setUpAndFinish();
    const Lines lines = fake.systemLog.lines();
    ASSERT_EQ(lines.size(), 6U);
    EXPECT_EQ(lines[4], "com.corvid.chatter setup+chosen: completed (1.000 seconds)");
    EXPECT_EQ(lines[5], "com.corvid.vidlink setup+chosen: completed (2.000 seconds)");
}

TEST_F(RemainingDelegateSetupTest, ARaisingPluginHarmsNoOther) {
    add("a").complete = [](const CompletionHandler&) {
        throw 42;
    };
    TestDelegate& other = add("b");
    respond("a");
    respond("b");
    setUpAndFinish();
    EXPECT_EQ(other.calls.size(), 1U);
    EXPECT_EQ(fake.systemLog.lines().back(), "b setup: completed (0.000 seconds)");
}

TEST_F(RemainingDelegateSetupTest, AHandlerMayBeCalledFromAnotherThreadAfterTheCallHasReturned) {
    std::vector<std::thread> threads;
    for (const char* identifier : {"a", "com.corvid.vidlink"}) {
        add(identifier).complete = [&](const CompletionHandler& handler) {
            for (int i = 0; i < 2; ++i) {
                threads.emplace_back([handler] { handler(true, std::nullopt); });
            }
        };
        respond(identifier);
    }
    setUp();
    fake.virtualTime.settle();
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(threads.size(), 4U);
    EXPECT_TRUE(group->wait(0ns));
    EXPECT_EQ(fake.systemLog.lines().size(), 6U) << "one outcome each";
}

TEST_F(RemainingDelegateSetupTest, OfTwoPluginsThatNowShareAnIdentifierOneRuns) {
    TestDelegate& first = add("a");
    TestDelegate& second = add("a");
    respond("a");
    setUpAndFinish();
    EXPECT_EQ(first.calls.size() + second.calls.size(), 1U);
}

TEST_F(RemainingDelegateSetupTest, AThousandDelegatesAreEachCompletedOnce) {
    for (int i = 0; i < 1000; ++i) {
        add("delegate " + std::to_string(i));
        respond("delegate " + std::to_string(i));
    }
    setUpAndFinish();
    for (const auto& plugin : plugins) {
        EXPECT_EQ(static_cast<TestDelegate&>(*plugin).calls.size(), 1U);
    }
}

} // namespace
} // namespace welcomer
