// The rules once more, as a table and the steps that go through it.

#include "cloud/WLNimbusServiceCatalogue.h"
#include "tests/unit/cloud/WLNimbusSetupWithDictionaryFixture.h"
#include "text/Describe.h"

#include <chrono>
#include <memory>
#include <optional>
#include <random>
#include <string>
#include <vector>

namespace welcomer {
namespace {

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

std::string enabling(const Scenario& scenario, const std::string& identifier) {
    return scenario.withWindow ? "CloudService.enableWithWindow " + identifier + ", yes, yes"
                               : "CloudService.enableSilently " + identifier + ", yes";
}

// The calls for the account and its documents alone.
void addDocumentsAlone(const Scenario& scenario, Strings& now) {
    const std::string& identifier = kRows.back().identifier;
    now.push_back("CloudAccount.serviceForID " + identifier);
    if (scenario.presence.back() != Presence::Missing) {
        now.push_back("CloudService.canBeEnabled " + identifier);
    }
    if (scenario.presence.back() != Presence::CanBeEnabled) {
        now.push_back(kLog + "Warning: Documents Service claims it cannot be enabled, trying anyway");
    }
    if (scenario.presence.back() != Presence::Missing) {
        now.push_back(enabling(scenario, identifier));
    }
}

// The line that keeps a service from being asked for, or none.
std::optional<std::string> whyNotAsked(const Scenario& scenario, std::size_t index, bool addressWasRead) {
    const Row& row = kRows[index];
    if (!scenario.selected[index]) {
        return row.optedOut;
    }
    if (row.afterLogin != scenario.postLogin) {
        return row.identifier + " should be configured " + (row.afterLogin ? "post-login" : "pre-login");
    }
    if (row.kind == Kind::Notes && !addressWasRead) {
        return "Cannot enable Nimbus notes without associated email address";
    }
    return std::nullopt;
}

// Every call on the platform, in order, until the last delayed service is enabled.
Strings expectedCalls(const Scenario& scenario) {
    Strings now{"AccountManager.accountForID anna, yes", "CloudAccount.suppressFailureDialogs"};
    Strings later;
    if (scenario.kvsOnly) {
        addDocumentsAlone(scenario, now);
        return now;
    }
    bool addressWasRead = false;
    for (std::size_t i = 0; i < kRows.size(); ++i) {
        const Row& row = kRows[i];
        if (const auto line = whyNotAsked(scenario, i, addressWasRead)) {
            now.push_back(kLog + *line);
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
        when.push_back(enabling(scenario, row.identifier));
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
