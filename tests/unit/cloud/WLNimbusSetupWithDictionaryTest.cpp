// The rules of enabling, one by one.

#include "cloud/WLNimbusSetupWithDictionary.h"
#include "cloud/WLNimbusServiceCatalogue.h"
#include "log/PCLogManager.h"
#include "tests/unit/cloud/WLNimbusSetupWithDictionaryFixture.h"
#include "text/Describe.h"

#include <chrono>
#include <cstdint>
#include <limits>
#include <memory>
#include <ostream>
#include <string>

namespace welcomer {
namespace {

TEST_F(WLNimbusSetupWithDictionaryTest, BeforeLoginEverythingSelected) {
    EXPECT_TRUE(setUp(false));
    EXPECT_EQ(lines(), (Strings{
                           std::string(kSKServiceIDContacts) + " should be configured post-login",
                           std::string(kSKServiceIDCalendars) + " should be configured post-login",
                           std::string(kSKServiceIDBookMarks) + " should be configured post-login",
                           "Enabling Nimbus service '" + std::string(kSKServiceIDMediaStream) + "'",
                           std::string(kSKServiceIDReminders) + " should be configured post-login",
                           "Enabling Nimbus service '" + std::string(kSKServiceIDAccountSync) + "'",
                           "Enabling Nimbus Locator",
                           std::string(kSKServiceIDMail) + " should be configured post-login",
                           std::string(kSKServiceIDNotes) + " should be configured post-login",
                           "Enabling Nimbus Documents & Data",
                       }));
    EXPECT_EQ(enabled(), (Strings{kSKServiceIDMediaStream, kSKServiceIDAccountSync, kSKServiceIDLOC,
                                  kSKServiceMobileDocuments}));
    const Strings before = fake.recorder.calls();
    fake.virtualTime.sleep(1h);
    EXPECT_EQ(fake.recorder.calls(), before); // nothing was scheduled for later
}

TEST_F(WLNimbusSetupWithDictionaryTest, AfterLoginEverythingSelected) {
    EXPECT_TRUE(setUp(true));
    EXPECT_EQ(lines(), (Strings{
                           "Enabling Nimbus service '" + std::string(kSKServiceIDContacts) + "'",
                           "Enabling '" + std::string(kSKServiceIDCalendars) + "' after a 3.00 second delay",
                           "Enabling Nimbus service '" + std::string(kSKServiceIDBookMarks) + "'",
                           std::string(kSKServiceIDMediaStream) + " should be configured pre-login",
                           "Enabling '" + std::string(kSKServiceIDReminders) + "' after a 3.00 second delay",
                           std::string(kSKServiceIDAccountSync) + " should be configured pre-login",
                           std::string(kSKServiceIDLOC) + " should be configured pre-login",
                           "Enabling Nimbus Mail: anna@example.org",
                           "Enabling Nimbus Notes",
                           std::string(kSKServiceMobileDocuments) + " should be configured pre-login",
                       }));
    EXPECT_EQ(enabled(),
              (Strings{kSKServiceIDContacts, kSKServiceIDBookMarks, kSKServiceIDMail, kSKServiceIDNotes}));
    EXPECT_EQ(fake.virtualTime.now(), 0ns);
    EXPECT_EQ(fake.virtualTime.queueNames(), Strings{}); // what is delayed is on the global queue
    fake.virtualTime.sleep(3s - 1ns);
    EXPECT_FALSE(service(kSKServiceIDCalendars).enabled);
    fake.systemLog.clear();
    fake.virtualTime.sleep(1ns);
    EXPECT_EQ(lines(), (Strings{"Enabling Nimbus service '" + std::string(kSKServiceIDCalendars) + "'",
                                "Enabling Nimbus service '" + std::string(kSKServiceIDReminders) + "'"}));
    EXPECT_TRUE(service(kSKServiceIDCalendars).enabled);
    EXPECT_TRUE(service(kSKServiceIDReminders).enabled);
    EXPECT_EQ(fake.recorder.callsTo("CloudService.enableWithWindow"), Strings{});
}

TEST_F(WLNimbusSetupWithDictionaryTest, DialogsAreSuppressedBeforeAnyServiceIsTouched) {
    setUp(true);
    const Strings calls = fake.recorder.calls();
    EXPECT_EQ(calls[0], "AccountManager.accountForID anna, yes");
    EXPECT_EQ(calls[1], "CloudAccount.suppressFailureDialogs");
    EXPECT_EQ(fake.recorder.callsTo("CloudAccount.suppressFailureDialogs").size(), 1U);
}

TEST_F(WLNimbusSetupWithDictionaryTest, WithoutAnAccountNothingElseIsDone) {
    fake.accountService.accounts.clear();
    fake.accountService.canCreateAccounts = false;
    platform::Error error{17, "as it was"};
    EXPECT_FALSE(WLNimbusSetupWithDictionary2(kAnna, kAllServices, false, true, nullptr, &error));
    EXPECT_EQ(fake.recorder.calls(),
              (Strings{"AccountManager.accountForID anna, yes", kLog + "Failed to retrieve SK_Account"}));
    EXPECT_EQ(error, (platform::Error{17, "as it was"}));
}

TEST_F(WLNimbusSetupWithDictionaryTest, WithoutAnAccountDocumentsAloneAreNotEnabledEither) {
    EXPECT_FALSE(WLNimbusSetupWithDictionary2({}, {}, true, false, nullptr, nullptr));
    EXPECT_EQ(fake.recorder.callsTo("CloudAccount."), Strings{});
}

TEST_F(WLNimbusSetupWithDictionaryTest, AMissingIdentifierIsPassedOnAsItIs) {
    EXPECT_FALSE(
        WLNimbusSetupWithDictionary2({{"other", "anna"}}, kAllServices, false, true, nullptr, nullptr));
    EXPECT_EQ(fake.recorder.callsTo("AccountManager."), Strings{"AccountManager.accountForID (null), yes"});
}

TEST_F(WLNimbusSetupWithDictionaryTest, AnIdentifierThatIsNoStringIsPassedOnAsItIs) {
    EXPECT_FALSE(WLNimbusSetupWithDictionary2({{kSKPropertyAccountID, 42}}, kAllServices, false, true,
                                              nullptr, nullptr));
    EXPECT_EQ(fake.recorder.callsTo("AccountManager."), Strings{"AccountManager.accountForID 42, yes"});
}

TEST_F(WLNimbusSetupWithDictionaryTest, AMissingAccountIsMade) {
    fake.accountService.accounts.clear();
    fake.accountService.servicesOfNewAccounts = {{kSKServiceIDBookMarks, {}}};
    EXPECT_TRUE(setUp(true));
    EXPECT_EQ(enabled(), Strings{kSKServiceIDBookMarks});
}

TEST_F(WLNimbusSetupWithDictionaryTest, TheErrorIsNeverWritten) {
    platform::Error error{17, "as it was"};
    for (const bool postLogin : {false, true}) {
        for (const bool kvsOnly : {false, true}) {
            EXPECT_TRUE(
                WLNimbusSetupWithDictionary2(kAnna, kAllServices, kvsOnly, postLogin, nullptr, &error));
        }
    }
    EXPECT_EQ(error, (platform::Error{17, "as it was"}));
}

TEST_F(WLNimbusSetupWithDictionaryTest, AMissingSyncServiceIsReportedLikeOneThatCannotBeEnabled) {
    services().erase(kSKServiceIDContacts);
    service(kSKServiceIDBookMarks).canBeEnabled = false;
    EXPECT_TRUE(setUp(true, {kSKServiceIDContacts, kSKServiceIDBookMarks}));
    EXPECT_TRUE(hasLine("Nimbus service '" + std::string(kSKServiceIDContacts) +
                        "' cannot be enabled on this machine for this user."));
    EXPECT_TRUE(hasLine("Nimbus service '" + std::string(kSKServiceIDBookMarks) +
                        "' cannot be enabled on this machine for this user."));
    EXPECT_EQ(enabled(), Strings{});
}

TEST_F(WLNimbusSetupWithDictionaryTest, AnEmptyMailAddressLetsNotesProceed) {
    setMailAddress("");
    EXPECT_TRUE(setUp(true));
    EXPECT_TRUE(hasLine("Could not enable Nimbus Mail, no address specified by SKService"));
    EXPECT_TRUE(hasLine("Enabling Nimbus Notes"));
    EXPECT_FALSE(service(kSKServiceIDMail).enabled);
    EXPECT_TRUE(service(kSKServiceIDNotes).enabled);
}

TEST_F(WLNimbusSetupWithDictionaryTest, AMailServiceThatCannotBeEnabledStillGivesNotesItsAddress) {
    service(kSKServiceIDMail).canBeEnabled = false;
    EXPECT_TRUE(setUp(true));
    EXPECT_TRUE(hasLine("Nimbus Mail cannot be enabled on this machine for this user."));
    EXPECT_FALSE(service(kSKServiceIDMail).enabled);
    EXPECT_TRUE(service(kSKServiceIDNotes).enabled);
}

TEST_F(WLNimbusSetupWithDictionaryTest, WithoutMailSelectedNotesHasNoAddress) {
    EXPECT_TRUE(setUp(true, allBut(kSKServiceIDMail)));
    EXPECT_TRUE(hasLine("User opted out of Nimbus Mail"));
    EXPECT_TRUE(hasLine("Cannot enable Nimbus notes without associated email address"));
    EXPECT_FALSE(service(kSKServiceIDNotes).enabled);
    EXPECT_EQ(fake.recorder.callsTo("CloudService.propertyValue"), Strings{});
}

TEST_F(WLNimbusSetupWithDictionaryTest, TheMailAddressIsReadBeforeMailIsAskedWhetherItCanBeEnabled) {
    setUp(true, {kSKServiceIDMail});
    EXPECT_EQ(fake.recorder.callsTo("CloudService."),
              (Strings{"CloudService.propertyValue " + std::string(kSKServiceIDMail) + ", " +
                           kSKPropertyMailEmailAddress,
                       "CloudService.canBeEnabled " + std::string(kSKServiceIDMail),
                       "CloudService.enableSilently " + std::string(kSKServiceIDMail) + ", yes"}));
}

TEST_F(WLNimbusSetupWithDictionaryTest, DocumentsAloneIgnoresThePhaseTheSelectionAndEverythingElse) {
    for (const bool postLogin : {false, true}) {
        fake.recorder.clear();
        EXPECT_TRUE(setUp(postLogin, {}, nullptr, true));
        EXPECT_EQ(
            fake.recorder.calls(),
            (Strings{"AccountManager.accountForID anna, yes", "CloudAccount.suppressFailureDialogs",
                     "CloudAccount.serviceForID " + std::string(kSKServiceMobileDocuments),
                     "CloudService.canBeEnabled " + std::string(kSKServiceMobileDocuments),
                     "CloudService.enableSilently " + std::string(kSKServiceMobileDocuments) + ", yes"}));
    }
}

TEST_F(WLNimbusSetupWithDictionaryTest, DocumentsAloneIsEnabledAlthoughItSaysThatItCannotBe) {
    service(kSKServiceMobileDocuments).canBeEnabled = false;
    EXPECT_TRUE(setUp(false, {}, nullptr, true));
    EXPECT_EQ(lines(), Strings{"Warning: Documents Service claims it cannot be enabled, trying anyway"});
    EXPECT_EQ(enabled(), Strings{kSKServiceMobileDocuments});
}

TEST_F(WLNimbusSetupWithDictionaryTest, DocumentsAloneWithoutSuchAServiceWarnsAndDoesNothing) {
    services().erase(kSKServiceMobileDocuments);
    EXPECT_TRUE(setUp(false, kAllServices, nullptr, true));
    EXPECT_EQ(lines(), Strings{"Warning: Documents Service claims it cannot be enabled, trying anyway"});
    EXPECT_EQ(fake.recorder.callsTo("CloudService."), Strings{});
}

TEST_F(WLNimbusSetupWithDictionaryTest, WithAWindowEveryEnablingPassesItAndCreatingYes) {
    const auto window = std::make_shared<Window>();
    for (const bool postLogin : {false, true}) {
        setUp(postLogin, kAllServices, window);
        fake.virtualTime.sleep(3s);
        EXPECT_EQ(fake.accountService.lastWindow, window.get());
        fake.accountService.lastWindow = nullptr;
    }
    setUp(false, {}, window, true);
    EXPECT_EQ(fake.accountService.lastWindow, window.get());
    EXPECT_EQ(fake.recorder.callsTo("CloudService.enableSilently"), Strings{});
    const Strings calls = fake.recorder.callsTo("CloudService.enableWithWindow");
    EXPECT_EQ(calls.size(), 11U);
    for (const std::string& call : calls) {
        EXPECT_TRUE(call.ends_with(", yes, yes")) << call;
    }
}

TEST_F(WLNimbusSetupWithDictionaryTest, ADelayCountsFromAfterItsLine) {
    PCLogManager::sharedManager().setObserver([&](const PCLogManager::Call& call) {
        if (call.message.ends_with("second delay")) {
            fake.virtualTime.sleep(10s);
        }
    });
    EXPECT_TRUE(setUp(true, {kSKServiceIDCalendars}));
    PCLogManager::sharedManager().setObserver({});
    fake.virtualTime.sleep(3s - 1ns);
    EXPECT_EQ(enabled(), Strings{});
    fake.virtualTime.sleep(1ns);
    EXPECT_EQ(enabled(), Strings{kSKServiceIDCalendars});
}

TEST_F(WLNimbusSetupWithDictionaryTest, ADelayedTaskKeepsTheWindowUntilItHasRun) {
    auto window = std::make_shared<Window>();
    const std::weak_ptr<Window> kept = window;
    setUp(true, {kSKServiceIDCalendars}, window);
    window.reset();
    EXPECT_FALSE(kept.expired());
    fake.virtualTime.sleep(3s);
    EXPECT_EQ(fake.accountService.lastWindow != nullptr, true);
    EXPECT_TRUE(kept.expired());
}

TEST_F(WLNimbusSetupWithDictionaryTest, ASelectionMayNameServicesThatDoNotExist) {
    EXPECT_TRUE(setUp(true, {"com.corvid.nimbus.service.unknown"}));
    EXPECT_EQ(enabled(), Strings{});
}

TEST_F(WLNimbusSetupWithDictionaryTest, TheShortFormIsAlwaysBeforeLogin) {
    const auto window = std::make_shared<Window>();
    EXPECT_TRUE(WLNimbusSetupWithDictionary(kAnna, kAllServices, window));
    EXPECT_EQ(enabled(), (Strings{kSKServiceIDMediaStream, kSKServiceIDAccountSync, kSKServiceIDLOC,
                                  kSKServiceMobileDocuments}));
    EXPECT_EQ(fake.accountService.lastWindow, window.get());
    for (const std::string& identifier : WLNimbusPostLoginServiceIDs()) {
        EXPECT_TRUE(hasLine(identifier + " should be configured post-login"));
    }
}

TEST_F(WLNimbusSetupWithDictionaryTest, TheShortFormsResultIsTheLongOnes) {
    fake.accountService.accounts.clear();
    fake.accountService.canCreateAccounts = false;
    EXPECT_FALSE(WLNimbusSetupWithDictionary(kAnna, kAllServices, nullptr));
}

TEST(WLNimbusSetupWithDictionaryDelayTest, ADelayedEnablingWhoseProcessEndsFirstNeverHappens) {
    fakes::CallRecorder calls;
    {
        World world;
        WLNimbusSetupWithDictionary2(kAnna, kAllServices, false, true, nullptr, nullptr);
        world.fake.virtualTime.sleep(2s);
        EXPECT_EQ(
            world.fake.recorder.callsTo("CloudService.enableSilently " + std::string(kSKServiceIDCalendars))
                .size(),
            0U);
        for (const std::string& call : world.fake.recorder.calls()) {
            calls.record(call);
        }
    } // the queue goes with what it has not run; nothing of it may be touched then
    EXPECT_EQ(calls.callsTo("CloudService.enableSilently").size(), 4U);
}

struct DelayCase {
    PropertyList value;
    std::string logged;
    std::chrono::nanoseconds delay; // the largest: never

    // Names the test.
    friend void PrintTo(const DelayCase& delayCase, std::ostream* out) {
        *out << text::describe(delayCase.value);
    }
};

class WLDebugPostLoginDelayTest : public testing::TestWithParam<DelayCase> {};

TEST_P(WLDebugPostLoginDelayTest, IsReadAsAnIntegerAndCountsWhenItIsAboveZero) {
    World world;
    world.setDelay(GetParam().value);
    WLNimbusSetupWithDictionary2(kAnna, {kSKServiceIDCalendars}, false, true, nullptr, nullptr);
    EXPECT_TRUE(world.hasLine("Enabling '" + std::string(kSKServiceIDCalendars) + "' after a " +
                              GetParam().logged + " second delay"));
    const auto& calendars = world.service(kSKServiceIDCalendars);
    if (GetParam().delay == std::chrono::nanoseconds::max()) {
        world.fake.virtualTime.sleep(24h * 365 * 100);
        EXPECT_FALSE(calendars.enabled);
        return;
    }
    world.fake.virtualTime.sleep(GetParam().delay - 1ns);
    EXPECT_FALSE(calendars.enabled);
    world.fake.virtualTime.sleep(1ns);
    EXPECT_TRUE(calendars.enabled);
}

INSTANTIATE_TEST_SUITE_P(
    Values, WLDebugPostLoginDelayTest,
    testing::Values(DelayCase{10, "10.00", 10s}, DelayCase{0, "3.00", 3s}, DelayCase{-1, "3.00", 3s},
                    DelayCase{std::numeric_limits<std::int64_t>::min(), "3.00", 3s},
                    DelayCase{"10", "10.00", 10s}, DelayCase{"ten", "3.00", 3s}, DelayCase{2.9, "2.00", 2s},
                    DelayCase{1, "1.00", 1s}, DelayCase{PropertyList::Array{}, "3.00", 3s},
                    DelayCase{std::numeric_limits<std::int64_t>::max(), "9223372036854775808.00",
                              std::chrono::nanoseconds::max()},
                    DelayCase{std::numeric_limits<std::uint64_t>::max(), "9223372036854775808.00",
                              std::chrono::nanoseconds::max()},
                    // The first whole number of seconds beyond the range of nanoseconds.
                    DelayCase{9'223'372'037, "9223372037.00", std::chrono::nanoseconds::max()}));

TEST(WLNimbusSetupWithDictionaryDelayTest, TheLongestDelayThatAClockCanReachIsKept) {
    World world;
    world.setDelay(9'223'372'036);
    WLNimbusSetupWithDictionary2(kAnna, {kSKServiceIDCalendars}, false, true, nullptr, nullptr);
    world.fake.virtualTime.sleep(9'223'372'036s - 1s);
    EXPECT_FALSE(world.service(kSKServiceIDCalendars).enabled);
    world.fake.virtualTime.sleep(1s);
    EXPECT_TRUE(world.service(kSKServiceIDCalendars).enabled);
}

} // namespace
} // namespace welcomer
