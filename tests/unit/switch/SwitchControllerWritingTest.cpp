// Writing, and file operations that fail.

#include "log/PCLogManager.h"
#include "switch/SwitchController.h"
#include "tests/unit/switch/SwitchControllerFixture.h"

#include <cerrno>
#include <cstdint>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace welcomer {
namespace {

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

} // namespace
} // namespace welcomer
