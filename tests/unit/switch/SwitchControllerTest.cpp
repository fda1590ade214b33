#include "switch/SwitchController.h"

#include "generated/WelcomerConfiguration.h"
#include "log/PCLogManager.h"
#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace welcomer {
namespace {

using Lines = std::vector<std::string>;
using Operation = fakes::FakeFileSystem::Operation;

const std::string kDirectory = "/etc/resolver";
constexpr std::uint64_t kNotFound = 9223372036854775807U;

const Lines kNames = {"Prod", "Nimbus1", "Nimbus2", "Nimbus3", "Nimbus4", "Q1", "Q2", "Q3", "Q4"};

std::string domain(std::size_t index) {
    return std::string(configuration::kResolverDomains.at(index));
}

std::string path(std::size_t index) {
    return kDirectory + "/" + domain(index);
}

// The override file of a domain for the environment at a position of kNames.
std::string overrideText(std::size_t domainIndex, std::size_t nameIndex) {
    return "# Switch override for Nimbus\ndomain " + domain(domainIndex) + "\nnameserver " +
           std::string(configuration::kTestNameservers.at(nameIndex - 1)) + "\n";
}

// Gives tests the operations that are not for hosts.
class OpenSwitchController : public SwitchController {
  public:
    using SwitchController::_readInitialConfiguration;
    using SwitchController::_writeConfigForServer;
};

class SwitchControllerTest : public testing::Test {
  protected:
    SwitchControllerTest() {
        fake.fileSystem.addDirectory("/etc");
        fake.processIdentity.setEffectiveUserID(0);
    }

    // What was logged since the last time.
    Lines logged() {
        const Lines lines = fake.systemLog.lines();
        fake.systemLog.clear();
        return lines;
    }

    void addOverride(const std::string& text) { fake.fileSystem.addFile(path(3), text); }

    // Makes a controller on an override file with this text.
    SwitchController& controllerReading(const std::string& text) {
        addOverride(text);
        return controller.emplace();
    }

    void expectNotParsed(const std::string& text) {
        logged();
        SwitchController& made = controllerReading(text);
        EXPECT_EQ(logged(), (Lines{"SwitchController isn't smart enough to parse:\n" + text}));
        EXPECT_EQ(made.theCurrentServerName(), std::nullopt);
        EXPECT_EQ(made.selectedIndex(), kNotFound);
        EXPECT_FALSE(made.isPointedToProd());
    }

    // The file system's calls that change something.
    Lines changes() {
        Lines found;
        for (const std::string& call : fake.recorder.callsTo("FileSystem.")) {
            if (!call.starts_with("FileSystem.readText") && !call.starts_with("FileSystem.exists")) {
                found.push_back(call);
            }
        }
        return found;
    }

    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
    std::optional<OpenSwitchController> controller;
};

// Reading

TEST_F(SwitchControllerTest, NoOverrideFileMeansProduction) {
    controller.emplace();
    EXPECT_EQ(controller->theCurrentServerName(), "Prod");
    EXPECT_EQ(controller->selectedIndex(), 0U);
    EXPECT_TRUE(controller->isPointedToProd());
    EXPECT_EQ(logged(), (Lines{"SwitchController thinks we are pointed to Prod"}));
}

TEST_F(SwitchControllerTest, ReadsTheFileOfTheFourthDomainAlone) {
    for (std::size_t index = 0; index < 3; ++index) {
        fake.fileSystem.addFile(path(index), overrideText(index, 3));
    }
    controller.emplace();
    EXPECT_EQ(controller->theCurrentServerName(), "Prod");
    EXPECT_EQ(fake.recorder.callsTo("FileSystem."), (Lines{"FileSystem.readText " + path(3)}));
}

TEST_F(SwitchControllerTest, RecognisesEveryEnvironmentByItsNameserver) {
    for (std::size_t index = 1; index < kNames.size(); ++index) {
        SwitchController& made = controllerReading(overrideText(3, index));
        EXPECT_EQ(made.theCurrentServerName(), kNames[index]);
        EXPECT_EQ(made.selectedIndex(), index);
        EXPECT_FALSE(made.isPointedToProd());
        EXPECT_EQ(logged(), (Lines{"SwitchController thinks we are pointed to " + kNames[index]}));
    }
}

TEST_F(SwitchControllerTest, AnAddressThatIsNotInTheTableIsNotParsed) {
    expectNotParsed("nameserver 203.0.113.7\n");
}

TEST_F(SwitchControllerTest, AFileWithoutANameserverLineIsNotParsed) {
    expectNotParsed("domain 192.0.2.1\n");
}

TEST_F(SwitchControllerTest, AnEmptyFileIsNotParsed) {
    expectNotParsed("");
}

TEST_F(SwitchControllerTest, ANameserverLineWithoutAnAddressIsNotParsed) {
    expectNotParsed("nameserver none\n");
}

TEST_F(SwitchControllerTest, ATrailingCommentThatEndsInADigitIsNotParsed) {
    expectNotParsed("nameserver 192.0.2.3 # environment 3\n");
}

TEST_F(SwitchControllerTest, ATrailingCommentWithoutDigitsIsTrimmedAway) {
    EXPECT_EQ(controllerReading("nameserver 192.0.2.3 # ours\n").theCurrentServerName(), "Nimbus3");
}

TEST_F(SwitchControllerTest, ANameserverIsLookedForInAnyPlaceOfALineCaseSensitively) {
    EXPECT_EQ(controllerReading("Nameserver 192.0.2.1\n  thenameserver192.0.2.2\n").theCurrentServerName(),
              "Nimbus2");
}

TEST_F(SwitchControllerTest, OfTwoNameserverLinesTheFirstCounts) {
    EXPECT_EQ(controllerReading("nameserver 192.0.2.4\nnameserver 192.0.2.1\n").theCurrentServerName(),
              "Nimbus4");
    expectNotParsed("# the nameserver\nnameserver 192.0.2.1\n");
}

TEST_F(SwitchControllerTest, LineEndsWithCarriageReturnsAreTrimmedAway) {
    EXPECT_EQ(controllerReading("domain x\r\nnameserver 198.51.100.2\r\n").theCurrentServerName(), "Q2");
}

TEST_F(SwitchControllerTest, ALastLineNeedsNoLineFeed) {
    EXPECT_EQ(controllerReading("nameserver 198.51.100.4").theCurrentServerName(), "Q4");
}

TEST_F(SwitchControllerTest, AMissingFileMeansProductionButAnUnparsableOneIsUnknown) {
    controller.emplace();
    EXPECT_TRUE(controller->isPointedToProd());
    logged();
    expectNotParsed("something else\n");
}

TEST_F(SwitchControllerTest, AFileThatIsNotUTF8MeansProduction) {
    EXPECT_EQ(controllerReading("nameserver 192.0.2.3\n# \xff\n").theCurrentServerName(), "Prod");
}

TEST_F(SwitchControllerTest, AFileThatIsTooLongMeansProduction) {
    const std::string line = "nameserver 192.0.2.3\n";
    EXPECT_EQ(controllerReading(line + std::string(1024 * 1024 - line.size(), ' ')).theCurrentServerName(),
              "Nimbus3");
    EXPECT_EQ(
        controllerReading(line + std::string(1024 * 1024 - line.size() + 1, ' ')).theCurrentServerName(),
        "Prod");
}

TEST_F(SwitchControllerTest, AnUnreadableFileMeansProduction) {
    fake.fileSystem.fail(Operation::ReadText, path(3), EACCES);
    EXPECT_EQ(controllerReading(overrideText(3, 1)).theCurrentServerName(), "Prod");
}

// Who may change it

TEST_F(SwitchControllerTest, OnlyTheSuperuserCanChangeTheConfiguration) {
    controller.emplace();
    EXPECT_TRUE(controller->canChangeConfiguration());
    fake.processIdentity.setEffectiveUserID(1000);
    EXPECT_FALSE(controller->canChangeConfiguration());
}

TEST_F(SwitchControllerTest, SetCanChangeConfigurationIsAOneWayLatchWhateverItsArgument) {
    for (const bool argument : {true, false}) {
        controller.emplace();
        EXPECT_TRUE(controller->canChangeConfiguration());
        controller->setCanChangeConfiguration(argument);
        EXPECT_FALSE(controller->canChangeConfiguration());
        controller->setCanChangeConfiguration(true);
        EXPECT_FALSE(controller->canChangeConfiguration());
    }
}

TEST_F(SwitchControllerTest, SelectingAsAnOrdinaryUserLogsThePermissionLineAndChangesNothing) {
    fake.processIdentity.setEffectiveUserID(1000);
    addOverride(overrideText(3, 2));
    controller.emplace();
    logged();
    for (const std::uint64_t index : {0U, 3U}) {
        controller->setSelectedIndex(index);
        EXPECT_EQ(logged(),
                  (Lines{"SwitchController doesn't have permission to write QA dns configuration"}));
    }
    EXPECT_EQ(controller->theCurrentServerName(), "Nimbus2");
    EXPECT_EQ(changes(), Lines());
}

// Choosing

TEST_F(SwitchControllerTest, OffersProductionAndThenTheEnvironmentsInOrder) {
    controller.emplace();
    EXPECT_EQ(controller->availableServers(), kNames);
}

TEST_F(SwitchControllerTest, TheListOfServersIsMadeOnce) {
    controller.emplace();
    const Lines& first = controller->availableServers();
    const_cast<Lines&>(first).emplace_back("a mark that a list made anew would not have");
    EXPECT_EQ(&controller->availableServers(), &first);
    EXPECT_EQ(controller->availableServers().size(), kNames.size() + 1);
}

TEST_F(SwitchControllerTest, AnIndexPastTheEndIsTheCallersError) {
    controller.emplace();
    EXPECT_THROW(controller->setSelectedIndex(9), std::out_of_range);
    EXPECT_THROW(controller->setSelectedIndex(kNotFound), std::out_of_range);
    EXPECT_EQ(changes(), Lines());
}

TEST_F(SwitchControllerTest, VisibilityIsKeptForTheHost) {
    controller.emplace();
    EXPECT_FALSE(controller->isVisible());
    controller->setIsVisible(true);
    EXPECT_TRUE(controller->isVisible());
    controller->setIsVisible(false);
    EXPECT_FALSE(controller->isVisible());
}

TEST_F(SwitchControllerTest, TheSharedControllerIsCreatedOnceAlsoWhenManyThreadsAskAtOnce) {
    std::vector<SwitchController*> seen(8);
    std::vector<std::thread> threads;
    threads.reserve(seen.size());
    for (SwitchController*& each : seen) {
        threads.emplace_back([&each] { each = &SwitchController::sharedController(); });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(seen, std::vector<SwitchController*>(seen.size(), seen.front()));
    EXPECT_EQ(fake.recorder.callsTo("FileSystem.readText").size(), 1U);
}

// Writing

TEST_F(SwitchControllerTest, AnEnvironmentIsFourFilesInDomainOrderEachOfThreeLines) {
    for (std::size_t index = 1; index < kNames.size(); ++index) {
        controller.emplace();
        fake.recorder.clear();
        logged();
        controller->setSelectedIndex(index);
        EXPECT_EQ(fake.recorder.callsTo("FileSystem.writeText"),
                  (Lines{"FileSystem.writeText " + path(0), "FileSystem.writeText " + path(1),
                         "FileSystem.writeText " + path(2), "FileSystem.writeText " + path(3)}));
        for (std::size_t file = 0; file < 4; ++file) {
            EXPECT_EQ(fake.fileSystem.content(path(file)), overrideText(file, index));
        }
        EXPECT_EQ(logged(), (Lines{"SwitchController redirected to " + kNames[index]}));
        EXPECT_EQ(controller->theCurrentServerName(), kNames[index]);
        EXPECT_EQ(controller->selectedIndex(), index);
        EXPECT_EQ(OpenSwitchController().theCurrentServerName(), kNames[index]);
    }
}

TEST_F(SwitchControllerTest, TheFolderIsRemovedFirstAndMadeOnce) {
    addOverride(overrideText(3, 1));
    controller.emplace();
    controller->setSelectedIndex(2);
    EXPECT_EQ(changes(), (Lines{"FileSystem.remove " + kDirectory, "FileSystem.createDirectory " + kDirectory,
                                "FileSystem.writeText " + path(0), "FileSystem.writeText " + path(1),
                                "FileSystem.writeText " + path(2), "FileSystem.writeText " + path(3)}));
    EXPECT_EQ(fake.fileSystem.mode(kDirectory), 0755U);
}

TEST_F(SwitchControllerTest, OverridesOfOtherOriginAreRemovedToo) {
    fake.fileSystem.addFile(kDirectory + "/other.example", "nameserver 203.0.113.1\n");
    controller.emplace();
    controller->setSelectedIndex(1);
    EXPECT_FALSE(fake.fileSystem.exists(kDirectory + "/other.example"));
}

TEST_F(SwitchControllerTest, ProductionIsNoFolderAtAll) {
    addOverride(overrideText(3, 1));
    controller.emplace();
    logged();
    controller->setSelectedIndex(0);
    EXPECT_FALSE(fake.fileSystem.exists(kDirectory));
    EXPECT_EQ(logged(), (Lines{"SwitchController returned to prod"}));
    EXPECT_TRUE(controller->isPointedToProd());
    EXPECT_EQ(changes(), (Lines{"FileSystem.remove " + kDirectory}));
}

TEST_F(SwitchControllerTest, ReturningToProductionWithoutAFolderSucceeds) {
    controller.emplace();
    logged();
    EXPECT_TRUE(controller->_writeConfigForServer("Prod"));
    EXPECT_EQ(logged(), (Lines{"SwitchController returned to prod"}));
}

TEST_F(SwitchControllerTest, SelectingTheCurrentEnvironmentDoesNothing) {
    addOverride(overrideText(3, 1));
    controller.emplace();
    logged();
    controller->setSelectedIndex(1);
    EXPECT_EQ(changes(), Lines());
    EXPECT_EQ(logged(), Lines());
}

TEST_F(SwitchControllerTest, AnUnknownEnvironmentCanBeLeftForAnyName) {
    for (const std::size_t index : {0U, 5U}) {
        SwitchController& made = controllerReading("not ours");
        made.setSelectedIndex(index);
        EXPECT_EQ(made.theCurrentServerName(), kNames[index]);
    }
}

TEST_F(SwitchControllerTest, AnUnknownNameIsLookedUpOnlyAfterTheRemoval) {
    addOverride(overrideText(3, 1));
    controller.emplace();
    logged();
    EXPECT_FALSE(controller->_writeConfigForServer("Elsewhere"));
    EXPECT_EQ(logged(), (Lines{"SwitchController is confused by server name Elsewhere"}));
    EXPECT_FALSE(fake.fileSystem.exists(kDirectory));
    EXPECT_EQ(controller->theCurrentServerName(), "Nimbus1"); // although the machine is at production now
}

TEST_F(SwitchControllerTest, TheLogNamesItsFunctions) {
    std::vector<std::pair<std::int32_t, std::string>> calls;
    PCLogManager::sharedManager().setObserver(
        [&](const PCLogManager::Call& call) { calls.emplace_back(call.type, call.function); });
    controller.emplace();
    controller->setSelectedIndex(1);
    PCLogManager::sharedManager().setObserver({});
    EXPECT_EQ(calls, (std::vector<std::pair<std::int32_t, std::string>>{
                         {1, "-[SwitchController _readInitialConfiguration]"},
                         {1, "-[SwitchController _writeConfigForServer:]"},
                     }));
}

// Failing file operations

class SwitchControllerFailureTest : public SwitchControllerTest {
  protected:
    // Selects Q1 from Nimbus1, and expects that nothing comes of it but one line.
    void expectRefusal(const std::string& line) {
        addOverride(overrideText(3, 1));
        controller.emplace();
        int told = 0;
        const auto observation = controller->observe(
            "theCurrentServerName", [&] { ++told; }, [&] { ++told; });
        logged();
        controller->setSelectedIndex(5);
        EXPECT_EQ(logged(), (Lines{line}));
        EXPECT_EQ(controller->theCurrentServerName(), "Nimbus1");
        EXPECT_EQ(told, 0);
    }

    // Selects Q1 and expects success.
    void expectSuccess() {
        controller.emplace();
        logged();
        controller->setSelectedIndex(5);
        EXPECT_EQ(logged(), (Lines{"SwitchController redirected to Q1"}));
        EXPECT_EQ(controller->theCurrentServerName(), "Q1");
    }
};

TEST_F(SwitchControllerFailureTest, ARemovalThatFailsEndsIt) {
    for (const int number : {0, EPERM, EBUSY, ENOTEMPTY, EROFS, EEXIST, EIO}) {
        fake.fileSystem.fail(Operation::Remove, kDirectory, number, "no removal");
        expectRefusal("SwitchController failed to remove previous config: no removal");
        EXPECT_EQ(fake.fileSystem.content(path(3)), overrideText(3, 1));
    }
}

TEST_F(SwitchControllerFailureTest, ARemovalThatFindsNothingIsAccepted) {
    expectSuccess();
}

TEST_F(SwitchControllerFailureTest, TheRemovalIsJudgedByTheErrorNumberNotByTheErrorObject) {
    fake.fileSystem.fail(Operation::Remove, kDirectory, 2, "a text that says something else");
    expectSuccess();
}

TEST_F(SwitchControllerFailureTest, AFolderThatCannotBeCreatedEndsIt) {
    for (const int number : {ENOENT, EACCES, ENOSPC, EROFS}) {
        fake.fileSystem.fail(Operation::CreateDirectory, kDirectory, number, "no folder");
        expectRefusal("SwitchController failed to create /etc/resolver: no folder");
        EXPECT_FALSE(fake.fileSystem.exists(kDirectory)); // the old overrides are gone
    }
}

TEST_F(SwitchControllerFailureTest, AFolderThatAppearsMeanwhileIsAccepted) {
    addOverride(overrideText(3, 1));
    fake.fileSystem.fail(Operation::Exists, kDirectory, EACCES); // so that it is created for every file
    expectSuccess();
    EXPECT_EQ(fake.recorder.callsTo("FileSystem.createDirectory").size(), 4U);
}

TEST_F(SwitchControllerFailureTest, AFolderThatIsFoundToExistCountsByItsErrorNumberAlone) {
    fake.fileSystem.addDirectory(kDirectory);
    fake.fileSystem.fail(Operation::Remove, kDirectory, 2);
    fake.fileSystem.fail(Operation::Exists, kDirectory, EACCES);
    fake.fileSystem.fail(Operation::CreateDirectory, kDirectory, 17, "a text that says something else");
    expectSuccess();
}

TEST_F(SwitchControllerFailureTest, AFileThatCannotBeWrittenEndsItAndTheFilesBeforeStay) {
    for (std::size_t failing = 0; failing < 4; ++failing) {
        fake.fileSystem.clearFailures();
        fake.fileSystem.fail(Operation::WriteText, path(failing), ENOSPC, "disk full");
        expectRefusal("SwitchController failed to write " + path(failing) + ": disk full");
        for (std::size_t file = 0; file < 4; ++file) {
            EXPECT_EQ(fake.fileSystem.content(path(file)),
                      file < failing ? std::optional(overrideText(file, 5)) : std::nullopt);
        }
    }
}

TEST_F(SwitchControllerFailureTest, NoErrorNumberOfAWriteIsAccepted) {
    for (const int number : {2, 17}) {
        fake.fileSystem.fail(Operation::WriteText, path(0), number, "no file");
        expectRefusal("SwitchController failed to write " + path(0) + ": no file");
    }
}

TEST_F(SwitchControllerFailureTest, WhatFailedCanBeTriedAgain) {
    fake.fileSystem.fail(Operation::WriteText, path(2), ENOSPC, "disk full");
    expectRefusal("SwitchController failed to write " + path(2) + ": disk full");
    fake.fileSystem.clearFailures();
    controller->setSelectedIndex(5);
    EXPECT_EQ(controller->theCurrentServerName(), "Q1");
    EXPECT_EQ(fake.fileSystem.content(path(3)), overrideText(3, 5));
}

// Observing

TEST_F(SwitchControllerTest, ObserversOfTheCurrentServerNameAreToldBeforeAndAfter) {
    controller.emplace();
    Lines told;
    const auto name = [&] {
        return controller->theCurrentServerName().value_or("none");
    };
    const auto observation = controller->observe(
        "theCurrentServerName", [&] { told.push_back("before " + name()); },
        [&] { told.push_back("after " + name()); });
    const auto other = controller->observe("isVisible", [&] { told.emplace_back("wrong key"); }, {});
    controller->setSelectedIndex(3);
    EXPECT_EQ(told, (Lines{"before Prod", "after Nimbus3"}));
    told.clear();
    controller->setSelectedIndex(3);
    EXPECT_EQ(told, Lines());
    controller->setSelectedIndex(0);
    EXPECT_EQ(told, (Lines{"before Nimbus3", "after Prod"}));
}

TEST_F(SwitchControllerTest, ObserversAreToldWhenTheInitialConfigurationIsRead) {
    controller.emplace();
    addOverride(overrideText(3, 6));
    Lines told;
    const auto name = [&] {
        return controller->theCurrentServerName().value_or("none");
    };
    const auto observation = controller->observe(
        "theCurrentServerName", [&] { told.push_back("before " + name()); },
        [&] { told.push_back("after " + name()); });
    controller->_readInitialConfiguration();
    EXPECT_EQ(told, (Lines{"before Prod", "after Q2"}));
}

// Two controllers

TEST_F(SwitchControllerTest, AControllerKeepsItsNameWhenAnotherOneSwitches) {
    OpenSwitchController first;
    OpenSwitchController second;
    first.setSelectedIndex(1);
    second.setSelectedIndex(6);
    EXPECT_EQ(first.theCurrentServerName(), "Nimbus1");
    EXPECT_EQ(second.theCurrentServerName(), "Q2");
    EXPECT_EQ(OpenSwitchController().theCurrentServerName(), "Q2");
    for (std::size_t file = 0; file < 4; ++file) {
        EXPECT_EQ(fake.fileSystem.content(path(file)), overrideText(file, 6));
    }
    first.setCanChangeConfiguration(true);
    EXPECT_FALSE(first.canChangeConfiguration());
    EXPECT_TRUE(second.canChangeConfiguration());
}

} // namespace
} // namespace welcomer
