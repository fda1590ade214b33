#include "state/WLKeychainSyncDestination.h"

#include "generated/WelcomerConfiguration.h"
#include "log/PCLogManager.h"
#include "tests/fakes/FakePlatform.h"
#include "tests/unit/state/SetupHost.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {
namespace {

using Lines = std::vector<std::string>;

const std::string kMarker = "/var/db/.WLFakeComplexRecovery";

class WLKeychainSyncDestinationTest : public testing::Test {
  protected:
    WLKeychainSyncDestinationTest() {
        fake.recorder.clear(); // of what the host's network manager read and logged
        fake.systemLog.clear();
    }

    void setScreenLock(bool asksForPassword) {
        fake.preferenceStore.setValue("askForPassword", asksForPassword, "com.corvid.screensaver");
    }

    void setReachable(bool reachable) {
        fake.hostReachability.flags = reachable ? std::uint32_t{platform::kHostReachable} : 0U;
    }

    bool determine() {
        return WLDetermineKeychainSyncDestination(
            host, [this](WLKeychainSyncDestination destination) { destinations.push_back(destination); });
    }

    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
    SetupHost host{fake.recorder};
    std::vector<std::int64_t> destinations;
};

TEST_F(WLKeychainSyncDestinationTest, TheDestinationsHaveTheirNumbers) {
    EXPECT_EQ(WLKeychainSyncDestinationCreateNSC, 0);
    EXPECT_EQ(WLKeychainSyncDestinationJoinExisting, 1);
    EXPECT_EQ(WLKeychainSyncDestinationVerifyNSC, 2);
    EXPECT_EQ(WLKeychainSyncDestinationSkip, 3);
}

// The rules, one by one

TEST_F(WLKeychainSyncDestinationTest, ADeskThatIsNotSecuredSkips) {
    setScreenLock(true); // not asked in the full setup
    host.answers.secureMyDesk = false;
    EXPECT_FALSE(determine());
    EXPECT_EQ(destinations, (std::vector<std::int64_t>{3}));
    EXPECT_EQ(host.flags, (HostFlags{.abortSyncSetup = true}));
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Keychain Sync was skipped because of screen lock setting."}));
}

TEST_F(WLKeychainSyncDestinationTest, TheReducedSetupAsksTheScreenLockInstead) {
    host.answers.isMiniGreeter = true;
    host.answers.secureMyDesk = false;
    setScreenLock(true);
    EXPECT_TRUE(determine());
    setScreenLock(false);
    host.answers.secureMyDesk = true;
    EXPECT_FALSE(determine());
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Keychain Sync was skipped because of screen lock setting."}));
}

TEST_F(WLKeychainSyncDestinationTest, AnInternetThatIsNotReachableSkips) {
    setReachable(false);
    EXPECT_FALSE(determine());
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"Keychain Sync was skipped because the internet is not reachable."}));
}

TEST_F(WLKeychainSyncDestinationTest, ANewAccountSkipsUnlessTheMakerProvidedIt) {
    host.answers.creating = true;
    EXPECT_FALSE(determine());
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"Keychain Sync was skipped because we are creating a new Nimbus account."}));
    host.answers.hasCorvidProvidedID = true;
    EXPECT_TRUE(determine());
}

TEST_F(WLKeychainSyncDestinationTest, CloudSetupThatWasSkippedSkipsAndItsLineDeliberatelyHasNoFullStop) {
    host.answers.mainAccountResponseDict = std::nullopt;
    EXPECT_FALSE(determine());
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Keychain Sync was skipped because Nimbus was skipped"}));
}

TEST_F(WLKeychainSyncDestinationTest, TheResponseIsAskedForOnlyWhenCloudSetupWasNotAbandoned) {
    host.answers.abortSetup = true;
    EXPECT_FALSE(determine());
    EXPECT_TRUE(fake.recorder.callsTo("cloud.mainAccountResponseDict").empty());
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Keychain Sync was skipped because Nimbus was skipped"}));
}

TEST_F(WLKeychainSyncDestinationTest, TheUpsellGoesOnWithoutAResponse) {
    host.answers.isKeychainUpsellGreeter = true;
    host.answers.mainAccountResponseDict = std::nullopt;
    EXPECT_TRUE(determine());
    EXPECT_EQ(fake.recorder.callsTo("helper.configure"),
              (Lines{"helper.configure cloud user, cloud password, none"}));
}

// After the rules

TEST_F(WLKeychainSyncDestinationTest, TheComponentsAreSeededForTheUserNameAsConfiguringLeftIt) {
    host.answers.usernameAfterConfiguring = "renamed user";
    EXPECT_TRUE(determine());
    EXPECT_EQ(fake.recorder.callsTo("helper.configure"),
              (Lines{"helper.configure cloud user, cloud password, {dsid = 1}"}));
    EXPECT_EQ(fake.recorder.callsTo("helper.seed"), (Lines{"helper.seed renamed user, cloud password"}));
}

TEST_F(WLKeychainSyncDestinationTest, ComponentsThatFailToInitialiseAbort) {
    host.answers.seedKeychainComponents = false;
    EXPECT_FALSE(determine());
    EXPECT_EQ(destinations, (std::vector<std::int64_t>{3}));
    EXPECT_EQ(host.flags, (HostFlags{.abortSyncSetup = true}));
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"Aborting Keychain Sync because components failed to initialize"}));
}

TEST_F(WLKeychainSyncDestinationTest, AnAbortAfterSeedingIsNeitherLoggedNorFlagged) {
    host.answers.abortSetupAfterSeeding = true;
    EXPECT_FALSE(determine());
    EXPECT_EQ(destinations, (std::vector<std::int64_t>{3}));
    EXPECT_EQ(host.flags, HostFlags());
    EXPECT_EQ(fake.systemLog.lines(), Lines());
}

TEST_F(WLKeychainSyncDestinationTest, AnUnknownCircleStatusIsNeitherLoggedNorFlagged) {
    for (const int status : {2, 3, -1}) {
        destinations.clear();
        host.answers.keychainSyncStatus = PropertyList::Dictionary{{"status", status}};
        EXPECT_FALSE(determine());
        EXPECT_EQ(destinations, (std::vector<std::int64_t>{3}));
        EXPECT_EQ(host.flags, HostFlags());
        EXPECT_EQ(fake.systemLog.lines(), Lines());
    }
}

TEST_F(WLKeychainSyncDestinationTest, AMissingCircleStatusMeansNoCircle) {
    for (const auto& answer :
         {std::optional(PropertyList::Dictionary()), std::optional<PropertyList::Dictionary>()}) {
        destinations.clear();
        host.answers.keychainSyncStatus = answer;
        EXPECT_TRUE(determine());
        EXPECT_EQ(destinations, (std::vector<std::int64_t>{0}));
    }
}

TEST_F(WLKeychainSyncDestinationTest, ACircleStatusThatIsNoNumberIsUnknown) {
    for (const PropertyList& status : {PropertyList(PropertyList::Array()), PropertyList("none"),
                                       PropertyList(PropertyList::Dictionary())}) {
        destinations.clear();
        host.answers.keychainSyncStatus = PropertyList::Dictionary{{"status", status}};
        EXPECT_FALSE(determine());
        EXPECT_EQ(destinations, (std::vector<std::int64_t>{3}));
        EXPECT_EQ(host.flags, HostFlags());
        EXPECT_EQ(fake.systemLog.lines(), Lines());
    }
}

TEST_F(WLKeychainSyncDestinationTest, TheCircleStatusIsItsIntegerValue) {
    for (const PropertyList& status :
         {PropertyList(1), PropertyList(1.9), PropertyList("1"), PropertyList(true)}) {
        destinations.clear();
        host.answers.keychainSyncStatus = PropertyList::Dictionary{{"status", status}};
        EXPECT_TRUE(determine());
        EXPECT_EQ(destinations, (std::vector<std::int64_t>{1}));
    }
}

TEST_F(WLKeychainSyncDestinationTest, ABackupThatIsGoneAgainIsCopiedToo) {
    host.flags.backupIsEnabled = true;
    EXPECT_TRUE(determine());
    EXPECT_FALSE(host.flags.backupIsEnabled);
}

TEST_F(WLKeychainSyncDestinationTest, TheCallbackIsCalledBeforeTheFunctionReturns) {
    bool returned = false;
    WLDetermineKeychainSyncDestination(host, [&](WLKeychainSyncDestination) { EXPECT_FALSE(returned); });
    returned = true;
}

TEST_F(WLKeychainSyncDestinationTest, TheLogNamesItsFunction) {
    Lines functions;
    PCLogManager::sharedManager().setObserver(
        [&](const PCLogManager::Call& call) { functions.emplace_back(call.function); });
    host.answers.keychainSyncStatus = PropertyList::Dictionary();
    determine();
    setReachable(false);
    determine();
    PCLogManager::sharedManager().setObserver({});
    EXPECT_EQ(functions, Lines(3, "BOOL _WLDetermineKeychainSyncDestination(SetupStateManager *, BOOL, void "
                                  "(^)(WLKeychainSyncDestination))"));
}

// Only checking

TEST_F(WLKeychainSyncDestinationTest, CheckingCreatesNoKeychainAndSaysThatNothingIsSkipped) {
    EXPECT_FALSE(WLShouldSkipKeychainSync(host));
    EXPECT_EQ(fake.recorder.callsTo("helper."), Lines());
    EXPECT_EQ(host.flags, HostFlags());
    EXPECT_EQ(fake.systemLog.lines(), Lines());
}

TEST_F(WLKeychainSyncDestinationTest, CheckingSetsTheAbortFlagAndLogsAsTheFullDecisionDoes) {
    setReachable(false);
    EXPECT_TRUE(WLShouldSkipKeychainSync(host));
    EXPECT_EQ(host.flags, (HostFlags{.abortSyncSetup = true}));
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"Keychain Sync was skipped because the internet is not reachable."}));
}

TEST_F(WLKeychainSyncDestinationTest, CheckingDoesNotCallBackUnlessARuleSkips) {
    const auto callback = [this](WLKeychainSyncDestination destination) {
        destinations.push_back(destination);
    };
    EXPECT_TRUE(_WLDetermineKeychainSyncDestination(host, true, callback));
    EXPECT_TRUE(destinations.empty());
    setReachable(false);
    EXPECT_FALSE(_WLDetermineKeychainSyncDestination(host, true, callback));
    EXPECT_EQ(destinations, (std::vector<std::int64_t>{3}));
}

// The names

class WLKeychainSyncDestinationNameTest : public WLKeychainSyncDestinationTest {
  protected:
    std::optional<std::string> name(std::int64_t destination) {
        return WLKeychainSyncDestinationName(host, static_cast<WLKeychainSyncDestination>(destination));
    }
};

TEST_F(WLKeychainSyncDestinationNameTest, CreatingAndJoiningHaveOneNameEach) {
    EXPECT_EQ(name(0), "NimbusKeychainCreateNSC");
    EXPECT_EQ(name(1), "NimbusKeychainJoinExisting");
    EXPECT_EQ(fake.recorder.calls(), Lines());
}

TEST_F(WLKeychainSyncDestinationNameTest, SkippingAndWhatIsNoDestinationHaveNone) {
    for (const std::int64_t destination : {std::int64_t{3}, std::int64_t{7}, std::int64_t{-1}, INT64_MIN}) {
        EXPECT_EQ(name(destination), std::nullopt);
    }
    EXPECT_EQ(fake.recorder.calls(), Lines());
}

TEST_F(WLKeychainSyncDestinationNameTest, AnEscrowedCodeIsVerifiedInTheSimpleOrTheComplexFlow) {
    EXPECT_EQ(name(2), "NimbusKeychainVerifyNSC");
    host.answers.escrowUsesComplexPasscode = true;
    EXPECT_EQ(name(2), "NimbusKeychainVerifyComplexNSCRecovery");
}

TEST_F(WLKeychainSyncDestinationNameTest, TheMarkerDeliberatelyForcesTheComplexFlow) {
    fake.fileSystem.addFile(kMarker, "");
    EXPECT_EQ(name(2), "NimbusKeychainVerifyComplexNSCRecovery");
}

TEST_F(WLKeychainSyncDestinationNameTest, TheEscrowIsAskedFirstAndTheMarkerIsLookedForInAnyCase) {
    host.answers.escrowUsesComplexPasscode = true;
    name(2);
    EXPECT_EQ(fake.recorder.calls(),
              (Lines{"helper.escrowUsesComplexPasscode", "FileSystem.exists " + kMarker}));
}

// Every combination of answers, against a model of its own: a script of what is to happen, ended by the first
// step that decides.

struct Situation {
    HostAnswers answers;
    bool screenLock = false;
    bool reachable = false;
    bool checkOnly = false;
};

class Model {
  public:
    explicit Model(const Situation& situation) { _play(situation, situation.answers); }

    Lines calls; // with the log lines among them
    bool result = false;
    std::vector<std::int64_t> destinations;
    HostFlags flags;

  private:
    void _play(const Situation& situation, const HostAnswers& host) {
        // Which rule skips?
        _call("host.isMiniGreeter");
        _call(host.isMiniGreeter ? "PreferenceStore.copyValue com.corvid.screensaver, askForPassword"
                                 : "user.secureMyDesk");
        if (host.isMiniGreeter ? !situation.screenLock : !host.secureMyDesk) {
            return _skip("Keychain Sync was skipped because of screen lock setting.");
        }
        const std::string probed(configuration::kPublicWebHost);
        _call("host.networkingManager");
        _call("HostReachability.createTarget " + probed);
        _call("HostReachability.flags " + probed);
        if (!situation.reachable) {
            return _skip("Keychain Sync was skipped because the internet is not reachable.");
        }
        _call("cloud.creating");
        if (host.creating) {
            _call("cloud.hasCorvidProvidedID");
            if (!host.hasCorvidProvidedID) {
                return _skip("Keychain Sync was skipped because we are creating a new Nimbus account.");
            }
        }
        _call("host.isKeychainUpsellGreeter");
        if (!host.isKeychainUpsellGreeter) {
            _call("cloud.abortSetup");
            if (!host.abortSetup) {
                _call("cloud.mainAccountResponseDict");
            }
            if (host.abortSetup || !host.mainAccountResponseDict) {
                return _skip("Keychain Sync was skipped because Nimbus was skipped");
            }
        }
        if (situation.checkOnly) {
            result = true;
            return;
        }

        // Preparing the keychain.
        _call("host.isMiniGreeter");
        if (!host.isMiniGreeter) {
            _call("user.userName");
            _call("user.password");
            _call("helper.createKeychain local user, local password");
        }
        _call("cloud.username");
        _call("cloud.password");
        _call("cloud.mainAccountResponseDict");
        _call(std::string("helper.configure cloud user, cloud password, ") +
              (host.mainAccountResponseDict ? "{dsid = 1}" : "none"));
        _call("cloud.username");
        _call("cloud.password");
        _call("helper.seed cloud user, cloud password");
        if (!host.seedKeychainComponents) {
            return _skip("Aborting Keychain Sync because components failed to initialize");
        }

        // Finding the way.
        _call("cloud.abortSetup");
        if (host.abortSetupAfterSeeding) {
            return _end(3);
        }
        _call("helper.query none");
        _call("helper.isBackupEnabled");
        _set("cloud.setBackupIsEnabled", flags.backupIsEnabled, host.isBackupEnabled);
        const std::int64_t status = *host.keychainSyncStatus->at("status").integer();
        if (status != 0) {
            return _end(status == 1 ? 1 : 3);
        }
        _log("There is no existing circle, so we should recover if possible");
        _call("cloud.backupIsEnabled");
        if (!host.isBackupEnabled) {
            _log("Backup is NOT enabled, so we can't recover");
            return _end(0);
        }
        _log("Backup is enabled, so we should recover");
        _set("cloud.setIsBackupNoCircleRecovery", flags.isBackupNoCircleRecovery, true);
        _end(2);
    }

    void _call(const std::string& call) { calls.push_back(call); }
    void _log(const std::string& line) { calls.push_back("SystemLog.write 115, " + line); }
    void _set(const std::string& call, bool& flag, bool value) {
        calls.push_back(call + (value ? " 1" : " 0"));
        flag = value;
    }
    void _skip(const std::string& line) {
        _log(line);
        _set("cloud.setAbortSyncSetup", flags.abortSyncSetup, true);
        _end(3);
    }
    void _end(std::int64_t destination) {
        calls.push_back("callback " + std::to_string(destination));
        destinations.push_back(destination);
        result = destination != 3;
    }
};

// All situations, numbered.
class Situations {
  public:
    static constexpr std::uint32_t kFlags = 13;
    static constexpr std::uint32_t kStatuses = 5; // -1 to 3
    static constexpr std::uint32_t kCount = (1U << kFlags) * kStatuses;

    static Situation at(std::uint32_t number) {
        const std::int64_t status = static_cast<std::int64_t>(number % kStatuses) - 1;
        std::uint32_t bits = number / kStatuses;
        const auto next = [&bits] {
            const bool bit = bits & 1U;
            bits >>= 1U;
            return bit;
        };
        Situation situation;
        HostAnswers& host = situation.answers;
        for (bool* flag : {&host.isMiniGreeter, &host.secureMyDesk, &situation.screenLock,
                           &situation.reachable, &host.creating, &host.hasCorvidProvidedID,
                           &host.isKeychainUpsellGreeter, &host.abortSetup, &host.abortSetupAfterSeeding,
                           &host.seedKeychainComponents, &host.isBackupEnabled, &situation.checkOnly}) {
            *flag = next();
        }
        if (!next()) {
            host.mainAccountResponseDict = std::nullopt;
        }
        host.keychainSyncStatus = PropertyList::Dictionary{{"status", status}};
        return situation;
    }
};

TEST_F(WLKeychainSyncDestinationTest, EveryCombinationOfAnswersIsDecidedAsTheModelSays) {
    for (std::uint32_t number = 0; number < Situations::kCount; ++number) {
        const Situation situation = Situations::at(number);
        const Model model(situation);
        host.restart(situation.answers);
        setReachable(situation.reachable);
        setScreenLock(situation.screenLock);
        fake.recorder.clear();
        fake.systemLog.clear();
        destinations.clear();

        const bool result = _WLDetermineKeychainSyncDestination(
            host, situation.checkOnly, [this](WLKeychainSyncDestination destination) {
                fake.recorder.record("callback " + std::to_string(destination));
                destinations.push_back(destination);
            });

        ASSERT_EQ(result, model.result) << number;
        ASSERT_EQ(destinations, model.destinations) << number;
        ASSERT_EQ(host.flags, model.flags) << number;
        ASSERT_EQ(fake.recorder.calls(), model.calls) << number;
    }
}

} // namespace
} // namespace welcomer
