// Reading, choosing and observing.

#include "switch/SwitchController.h"
#include "tests/unit/switch/SwitchControllerFixture.h"

#include <cerrno>
#include <cstdint>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

namespace welcomer {
namespace {

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
