#include "cloud/WLNimbusSetupWithDictionary.h"

#include "cloud/WLNimbusServiceCatalogue.h"
#include "log/PCLogManager.h"
#include "tests/fakes/FakePlatform.h"
#include "text/Describe.h"

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <gtest/gtest.h>
#include <limits>
#include <memory>
#include <optional>
#include <ostream>
#include <random>
#include <string>
#include <vector>

namespace welcomer {
namespace {

using namespace platform;
using namespace std::chrono_literals;
using Strings = std::vector<std::string>;
using Dictionary = PropertyList::Dictionary;
using Services = fakes::FakeAccountService::Services;

const Dictionary kAnna{{kSKPropertyAccountID, "anna"}};
const Strings kAllServices = WLNimbusAllSetupServiceIDs();
const std::string kLog = "SystemLog.write 115, ";

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

// The rules once more, as a table and the steps that go through it.
namespace model {

enum class Kind { Plain, Mail, Notes };
enum class Presence { Missing, CannotBeEnabled, CanBeEnabled };

struct Row {
    std::string identifier;
    bool afterLogin;
    bool delayed;
    Kind kind;
    std::string optedOut, missing, cannot, enabling;
};

Row syncRow(const std::string& identifier, bool afterLogin, bool delayed) {
    const std::string cannot =
        "Nimbus service '" + identifier + "' cannot be enabled on this machine for this user.";
    return {identifier,
            afterLogin,
            delayed,
            Kind::Plain,
            "User opted out of " + identifier,
            cannot,
            cannot,
            "Enabling Nimbus service '" + identifier + "'"};
}

Row namedRow(const std::string& identifier, const std::string& name, bool afterLogin, Kind kind,
             const std::string& enabling) {
    return {identifier,
            afterLogin,
            false,
            kind,
            "User opted out of Nimbus " + name,
            "No Nimbus " + name + " service available to enable",
            "Nimbus " + name + " cannot be enabled on this machine for this user.",
            enabling};
}

const std::vector<Row> kRows{
    syncRow("com.corvid.nimbus.service.contacts", true, false),
    syncRow("com.corvid.nimbus.service.calendars", true, true),
    syncRow("com.corvid.nimbus.service.bookmarks", true, false),
    syncRow("com.corvid.nimbus.service.mediastream", false, false),
    syncRow("com.corvid.nimbus.service.reminders", true, true),
    syncRow("com.corvid.nimbus.service.accountsync", false, false),
    namedRow("com.corvid.nimbus.service.locator", "Locator", false, Kind::Plain, "Enabling Nimbus Locator"),
    namedRow("com.corvid.nimbus.service.mail", "Mail", true, Kind::Mail, "Enabling Nimbus Mail: "),
    namedRow("com.corvid.nimbus.service.notes", "Notes", true, Kind::Notes, "Enabling Nimbus Notes"),
    namedRow("com.corvid.nimbus.service.documents", "Documents & Data", false, Kind::Plain,
             "Enabling Nimbus Documents & Data"),
};

struct Scenario {
    bool postLogin = false;
    bool withWindow = false;
    bool kvsOnly = false;
    std::vector<bool> selected = std::vector<bool>(kRows.size(), false);
    std::vector<Presence> presence = std::vector<Presence>(kRows.size(), Presence::CanBeEnabled);
    std::optional<PropertyList> address;

    std::string describe() const {
        std::string text = postLogin ? "after" : "before";
        text += withWindow ? ", window" : "";
        text += kvsOnly ? ", documents only" : "";
        for (std::size_t i = 0; i < kRows.size(); ++i) {
            text += ' ' + std::to_string(int(selected[i])) + std::to_string(int(presence[i]));
        }
        return text + ", address " + text::describe(address);
    }
};

// Every call on the platform, in order, until the last delayed service is enabled.
Strings expectedCalls(const Scenario& scenario) {
    Strings now{"AccountManager.accountForID anna, yes", "CloudAccount.suppressFailureDialogs"};
    Strings later;
    const auto enabling = [&](const std::string& identifier) {
        return scenario.withWindow ? "CloudService.enableWithWindow " + identifier + ", yes, yes"
                                   : "CloudService.enableSilently " + identifier + ", yes";
    };
    if (scenario.kvsOnly) {
        const std::string& identifier = kRows.back().identifier;
        now.push_back("CloudAccount.serviceForID " + identifier);
        if (scenario.presence.back() != Presence::Missing) {
            now.push_back("CloudService.canBeEnabled " + identifier);
        }
        if (scenario.presence.back() != Presence::CanBeEnabled) {
            now.push_back(kLog + "Warning: Documents Service claims it cannot be enabled, trying anyway");
        }
        if (scenario.presence.back() != Presence::Missing) {
            now.push_back(enabling(identifier));
        }
        return now;
    }
    bool addressWasRead = false;
    for (std::size_t i = 0; i < kRows.size(); ++i) {
        const Row& row = kRows[i];
        if (!scenario.selected[i]) {
            now.push_back(kLog + row.optedOut);
            continue;
        }
        if (row.afterLogin != scenario.postLogin) {
            now.push_back(kLog + row.identifier + " should be configured " +
                          (row.afterLogin ? "post-login" : "pre-login"));
            continue;
        }
        if (row.kind == Kind::Notes && !addressWasRead) {
            now.push_back(kLog + "Cannot enable Nimbus notes without associated email address");
            continue;
        }
        now.push_back("CloudAccount.serviceForID " + row.identifier);
        if (scenario.presence[i] == Presence::Missing) {
            now.push_back(kLog + row.missing);
            continue;
        }
        if (row.kind == Kind::Mail) {
            now.push_back("CloudService.propertyValue " + row.identifier +
                          ", com.corvid.nimbus.property.mailEmailAddress");
            addressWasRead = scenario.address.has_value();
        }
        now.push_back("CloudService.canBeEnabled " + row.identifier);
        if (scenario.presence[i] == Presence::CannotBeEnabled) {
            now.push_back(kLog + row.cannot);
            continue;
        }
        std::string line = row.enabling;
        if (row.kind == Kind::Mail) {
            if (!scenario.address || !scenario.address->isString() || scenario.address->string()->empty()) {
                now.push_back(kLog + "Could not enable Nimbus Mail, no address specified by SKService");
                continue;
            }
            line += *scenario.address->string();
        }
        if (row.delayed) {
            now.push_back("PreferenceStore.copyValue com.corvid.welcomer, WLDebugPostLoginDelay");
            now.push_back(kLog + "Enabling '" + row.identifier + "' after a 3.00 second delay");
        }
        Strings& when = row.delayed ? later : now;
        when.push_back(kLog + line);
        when.push_back(enabling(row.identifier));
    }
    now.insert(now.end(), later.begin(), later.end());
    return now;
}

void check(const Scenario& scenario) {
    World world;
    Strings selected;
    for (std::size_t i = 0; i < kRows.size(); ++i) {
        const std::string& identifier = kRows[i].identifier;
        if (scenario.selected[i]) {
            selected.push_back(identifier);
        }
        if (scenario.presence[i] == Presence::Missing) {
            world.services().erase(identifier);
        } else {
            world.service(identifier).canBeEnabled = scenario.presence[i] == Presence::CanBeEnabled;
            if (kRows[i].kind == Kind::Mail) {
                world.setMailAddress(scenario.address);
            }
        }
    }
    const auto window = scenario.withWindow ? std::make_shared<Window>() : nullptr;
    EXPECT_TRUE(
        WLNimbusSetupWithDictionary2(kAnna, selected, scenario.kvsOnly, scenario.postLogin, window, nullptr));
    world.fake.virtualTime.sleep(3s);
    ASSERT_EQ(world.fake.recorder.calls(), expectedCalls(scenario)) << scenario.describe();
}

constexpr Presence kPresences[] = {Presence::Missing, Presence::CannotBeEnabled, Presence::CanBeEnabled};

} // namespace model

class WLNimbusSetupWithDictionaryModelTest : public testing::Test {};

TEST_F(WLNimbusSetupWithDictionaryModelTest, TheModelsServicesAreTheCatalogues) {
    Strings identifiers;
    for (const model::Row& row : model::kRows) {
        identifiers.push_back(row.identifier);
    }
    EXPECT_EQ(identifiers, kAllServices);
}

TEST_F(WLNimbusSetupWithDictionaryModelTest, EachServiceInEveryCombination) {
    for (std::size_t i = 0; i < model::kRows.size(); ++i) {
        for (const bool othersSelected : {false, true}) {
            for (const bool selected : {false, true}) {
                for (const model::Presence presence : model::kPresences) {
                    for (int flags = 0; flags < 8; ++flags) {
                        model::Scenario scenario;
                        scenario.postLogin = flags & 1;
                        scenario.withWindow = flags & 2;
                        scenario.kvsOnly = flags & 4;
                        scenario.address = "anna@example.org";
                        scenario.selected.assign(model::kRows.size(), othersSelected);
                        scenario.selected[i] = selected;
                        scenario.presence[i] = presence;
                        ASSERT_NO_FATAL_FAILURE(model::check(scenario));
                    }
                }
            }
        }
    }
}

TEST_F(WLNimbusSetupWithDictionaryModelTest, MailAndNotesTogetherInEveryCombination) {
    constexpr std::size_t kMail = 7;
    constexpr std::size_t kNotes = 8;
    const std::optional<PropertyList> addresses[] = {std::nullopt, "", "anna@example.org", 42};
    for (const auto& address : addresses) {
        for (int flags = 0; flags < 16; ++flags) {
            for (const model::Presence mail : model::kPresences) {
                for (const model::Presence notes : model::kPresences) {
                    model::Scenario scenario;
                    scenario.postLogin = flags & 1;
                    scenario.withWindow = flags & 2;
                    scenario.selected[kMail] = flags & 4;
                    scenario.selected[kNotes] = flags & 8;
                    scenario.presence[kMail] = mail;
                    scenario.presence[kNotes] = notes;
                    scenario.address = address;
                    ASSERT_NO_FATAL_FAILURE(model::check(scenario));
                }
            }
        }
    }
}

TEST_F(WLNimbusSetupWithDictionaryModelTest, AllServicesTogetherInTwoThousandRandomCombinations) {
    std::mt19937 random(20131); // the same ones in every run
    const auto flip = [&] {
        return random() % 2 == 0;
    };
    for (int i = 0; i < 2000; ++i) {
        model::Scenario scenario;
        scenario.postLogin = flip();
        scenario.withWindow = flip();
        scenario.kvsOnly = random() % 10 == 0;
        for (std::size_t row = 0; row < model::kRows.size(); ++row) {
            scenario.selected[row] = random() % 4 != 0;
            scenario.presence[row] = model::kPresences[random() % 3];
        }
        if (flip()) {
            scenario.address = flip() ? "" : "anna@example.org";
        }
        ASSERT_NO_FATAL_FAILURE(model::check(scenario));
    }
}

} // namespace
} // namespace welcomer
