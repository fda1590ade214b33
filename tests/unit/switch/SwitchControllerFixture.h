// What the tests of the switch share.

#pragma once

#include "generated/WelcomerConfiguration.h"
#include "switch/SwitchController.h"
#include "tests/fakes/FakePlatform.h"

#include <cstdint>
#include <gtest/gtest.h>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {

using Lines = std::vector<std::string>;
using Operation = fakes::FakeFileSystem::Operation;

inline const std::string kDirectory = "/etc/resolver";
inline constexpr std::uint64_t kNotFound = 9223372036854775807U;

inline const Lines kNames = {"Prod", "Nimbus1", "Nimbus2", "Nimbus3", "Nimbus4", "Q1", "Q2", "Q3", "Q4"};

inline std::string domain(std::size_t index) {
    return std::string(configuration::kResolverDomains.at(index));
}

inline std::string path(std::size_t index) {
    return kDirectory + "/" + domain(index);
}

// The override file of a domain for the environment at a position of kNames.
inline std::string overrideText(std::size_t domainIndex, std::size_t nameIndex) {
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

} // namespace welcomer
