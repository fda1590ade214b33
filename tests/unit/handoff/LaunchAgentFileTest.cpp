#include "handoff/LaunchAgentFile.h"

#include "propertylist/PropertyListReader.h"

#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <iterator>
#include <string>

namespace welcomer {
namespace {

PropertyList launchAgentFile() {
    std::ifstream file(WELCOMER_LAUNCH_AGENT_FILE);
    const std::string bytes{std::istreambuf_iterator<char>(file), {}};
    const PropertyListReadResult read = readPropertyList(bytes);
    EXPECT_EQ(read.error, "");
    return read.value.value_or(PropertyList());
}

TEST(LaunchAgentFile, HasTheNameByWhichTheAgentRemovesIt) {
    EXPECT_EQ(std::filesystem::path(WELCOMER_LAUNCH_AGENT_FILE).filename(),
              std::string(kLaunchAgentLabel) + "." + kLaunchAgentFileType);
    EXPECT_EQ(launchAgentFile().find("Label")->string()->c_str(), std::string(kLaunchAgentLabel));
}

TEST(LaunchAgentFile, StartsTheInstalledAgentOnceAtLoginWithTheLabelAsItsOnlyArgument) {
    const PropertyList expected(PropertyList::Dictionary{
        {"Label", kLaunchAgentLabel},
        {"ProgramArguments", PropertyList::Array{WELCOMER_AGENT_PATH, kLaunchAgentLabel}},
        {"RunAtLoad", true},
    });
    EXPECT_EQ(launchAgentFile(), expected);
    EXPECT_EQ(std::filesystem::path(WELCOMER_AGENT_PATH).filename(), kAgentProgramName);
}

} // namespace
} // namespace welcomer
