// The flags that these functions set last for the rest of the process; each test has a process of its own.

#include "cloud/WLSetupProbes.h"

#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

namespace welcomer {
namespace {

using Strings = std::vector<std::string>;

const std::string kMarker = "/var/db/.ShowHardwareWarranty";
const std::string kTransitionTool = "/usr/libexec/transition";

class WLSetupProbesTest : public testing::Test {
  protected:
    void setAskForPassword(const std::optional<PropertyList>& value) {
        fake.preferenceStore.store("com.corvid.screensaver", "askForPassword", value);
        fake.preferenceStore.synchronise("com.corvid.screensaver");
    }

    Strings lines() const { return fake.systemLog.lines(); }

    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
};

TEST_F(WLSetupProbesTest, TheScreenLockAsksForNoPasswordWithoutAValue) {
    EXPECT_FALSE(WLScreenLockRequiresPassword());
    EXPECT_EQ(fake.recorder.calls(),
              Strings{"PreferenceStore.copyValue com.corvid.screensaver, askForPassword"});
}

TEST_F(WLSetupProbesTest, TheScreenLocksValueIsReadAsABooleanEveryTime) {
    for (const PropertyList& value : {PropertyList(true), PropertyList(1), PropertyList("YES")}) {
        setAskForPassword(value);
        EXPECT_TRUE(WLScreenLockRequiresPassword());
    }
    for (const PropertyList& value : {PropertyList(false), PropertyList(0), PropertyList("no"),
                                      PropertyList(PropertyList::Array{true})}) {
        setAskForPassword(value);
        EXPECT_FALSE(WLScreenLockRequiresPassword());
    }
}

TEST_F(WLSetupProbesTest, TheOverrideTrueAnswersWithoutReadingAnything) {
    setAskForPassword(false);
    fake.recorder.clear();
    WLSetScreenLockRequiresPasswordOverride(true);
    EXPECT_TRUE(WLScreenLockRequiresPassword());
    EXPECT_EQ(fake.recorder.calls(), Strings{});
}

TEST_F(WLSetupProbesTest, TheOverrideFalseAnswersToo) {
    setAskForPassword(true);
    WLSetScreenLockRequiresPasswordOverride(false);
    EXPECT_FALSE(WLScreenLockRequiresPassword());
}

TEST_F(WLSetupProbesTest, OfSeveralOverridesTheLastOneAnswers) {
    for (const bool value : {true, false, false, true}) {
        WLSetScreenLockRequiresPasswordOverride(value);
        EXPECT_EQ(WLScreenLockRequiresPassword(), value);
    }
}

TEST_F(WLSetupProbesTest, DelegateResponsesMayAlwaysBeLoggedAfterTheDefaultAndTheFolderWereLookedAt) {
    EXPECT_TRUE(WLShouldLogDelegateResponses());
    EXPECT_EQ(fake.recorder.calls(),
              (Strings{"PreferenceStore.copyValue com.corvid.welcomer, WLLogDelegateResponses",
                       "FileSystem.exists /CorvidInternal"}));
}

TEST_F(WLSetupProbesTest, TheDefaultForDelegateResponsesSparesTheLookAtTheFolder) {
    fake.preferenceStore.store("com.corvid.welcomer", "WLLogDelegateResponses", true);
    EXPECT_TRUE(WLShouldLogDelegateResponses());
    EXPECT_EQ(fake.recorder.callsTo("FileSystem."), Strings{});
}

TEST_F(WLSetupProbesTest, DelegateResponsesMayBeLoggedAlsoWhenTheDefaultIsFalse) {
    fake.preferenceStore.store("com.corvid.welcomer", "WLLogDelegateResponses", false);
    fake.fileSystem.addDirectory("/CorvidInternal");
    EXPECT_TRUE(WLShouldLogDelegateResponses());
}

TEST_F(WLSetupProbesTest, FinishedSetupIsLoggedAndThenToldWithNothingToAdd) {
    WLCallTesselFinishedSetup();
    EXPECT_EQ(fake.recorder.calls(), (Strings{"SystemLog.write 115, WLCallTesselFinishedSetup",
                                              "AccountManager.markSetupFinished (null)"}));
}

TEST_F(WLSetupProbesTest, TheTransitionToolRunsWithoutArguments) {
    fake.processLauncher.programs[kTransitionTool] = [](const auto&) {
        return 0;
    };
    EXPECT_TRUE(WLRunTransitionTool());
    EXPECT_EQ(fake.recorder.calls(), (Strings{"ProcessLauncher.launchAndWait " + kTransitionTool,
                                              "SystemLog.write 115, Ran transition tool"}));
}

TEST_F(WLSetupProbesTest, ATransitionToolThatFailsWasRunAllTheSame) {
    fake.processLauncher.programs[kTransitionTool] = [](const auto&) {
        return 1;
    };
    EXPECT_TRUE(WLRunTransitionTool());
    EXPECT_EQ(lines(), Strings{"Ran transition tool"});
}

TEST_F(WLSetupProbesTest, AMissingTransitionToolIsLogged) {
    EXPECT_FALSE(WLRunTransitionTool());
    EXPECT_EQ(lines(), Strings{"Failed to exec transition tool: /usr/libexec/transition: "
                               "No such file or directory"});
}

TEST_F(WLSetupProbesTest, EveryStandardExceptionOfTheTransitionToolIsLogged) {
    fake.processLauncher.programs[kTransitionTool] = [](const auto&) -> int {
        throw std::logic_error("gone");
    };
    EXPECT_FALSE(WLRunTransitionTool());
    EXPECT_EQ(lines(), Strings{"Failed to exec transition tool: gone"});
}

TEST_F(WLSetupProbesTest, WhatElseTheTransitionToolRaisesReachesTheCaller) {
    fake.processLauncher.programs[kTransitionTool] = [](const auto&) -> int {
        throw 42;
    };
    EXPECT_THROW(WLRunTransitionTool(), int);
    EXPECT_EQ(lines(), Strings{});
}

TEST_F(WLSetupProbesTest, AnAbsentWarrantyMarkerIsLookedForAgainEveryTime) {
    EXPECT_FALSE(WLShouldShowHardwareWarranty());
    EXPECT_FALSE(WLShouldShowHardwareWarranty());
    fake.fileSystem.addFile(kMarker, "");
    EXPECT_TRUE(WLShouldShowHardwareWarranty());
    EXPECT_EQ(fake.recorder.calls(), Strings(3, "FileSystem.exists " + kMarker));
}

TEST_F(WLSetupProbesTest, AWarrantyMarkerThatWasSeenSticksAlsoAfterItsRemoval) {
    fake.fileSystem.addFile(kMarker, "");
    EXPECT_TRUE(WLShouldShowHardwareWarranty());
    WLRemoveHardwareWarrantyMarker();
    EXPECT_EQ(fake.fileSystem.content(kMarker), std::nullopt);
    fake.recorder.clear();
    EXPECT_TRUE(WLShouldShowHardwareWarranty());
    EXPECT_EQ(fake.recorder.calls(), Strings{});
}

TEST_F(WLSetupProbesTest, AWarrantyMarkerThatWasRemovedUnseenIsNotShown) {
    fake.fileSystem.addFile(kMarker, "");
    WLRemoveHardwareWarrantyMarker();
    EXPECT_FALSE(WLShouldShowHardwareWarranty());
}

TEST_F(WLSetupProbesTest, RemovingTheWarrantyMarkerReportsNothingWhateverComesOfIt) {
    WLRemoveHardwareWarrantyMarker();
    fake.fileSystem.addFile(kMarker, "");
    fake.fileSystem.fail(fakes::FakeFileSystem::Operation::Remove, kMarker, 30);
    WLRemoveHardwareWarrantyMarker();
    EXPECT_EQ(lines(), Strings{});
    EXPECT_EQ(fake.recorder.callsTo("FileSystem.remove").size(), 2U);
}

} // namespace
} // namespace welcomer
