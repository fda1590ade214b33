// The rules of the sync destination, one by one.

#include "state/WLKeychainSyncDestination.h"
#include "log/PCLogManager.h"
#include "tests/unit/state/WLKeychainSyncDestinationFixture.h"

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {
namespace {

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

} // namespace
} // namespace welcomer
