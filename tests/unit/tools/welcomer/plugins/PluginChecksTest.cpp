// The table of the checks for plug-ins.

#include "tools/welcomer/plugins/PluginChecks.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <set>
#include <string>

namespace welcomer::tool {

namespace {

TEST(PluginChecks, haveNamesOfTheirOwn) {
    std::set<std::string_view> names;
    for (const PluginCheck& check : pluginChecks()) {
        EXPECT_TRUE(names.insert(check.name).second) << check.name;
        EXPECT_FALSE(check.name.empty());
        EXPECT_EQ(check.name.find_first_not_of("abcdefghijklmnopqrstuvwxyz-"), std::string_view::npos)
            << check.name;
    }
    EXPECT_GE(names.size(), 40U);
}

TEST(PluginChecks, sayOnOneLineWhatTheyAreForAndWhereThatIsDocumented) {
    for (const PluginCheck& check : pluginChecks()) {
        EXPECT_FALSE(check.description.empty()) << check.name;
        EXPECT_EQ(check.description.find('\n'), std::string_view::npos) << check.name;
        EXPECT_NE(check.documented.find(": "), std::string_view::npos) << check.name;
        EXPECT_NE(check.run, nullptr) << check.name;
    }
}

TEST(PluginChecks, needOnlyWhatWasMadeBefore) {
    std::set<std::string_view> before;
    for (const PluginCheck& check : pluginChecks()) {
        EXPECT_TRUE(check.needs.empty() || before.contains(check.needs)) << check.name;
        before.insert(check.name);
    }
}

// What is only better otherwise must not keep other checks from being made.
TEST(PluginChecks, needNoneThatOnlyWarns) {
    for (const PluginCheck& check : pluginChecks()) {
        const auto needed = std::ranges::find(pluginChecks(), check.needs, &PluginCheck::name);
        EXPECT_TRUE(check.needs.empty() || needed->severity == Severity::Failure) << check.name;
    }
}

} // namespace

} // namespace welcomer::tool
