#include "agent/selfDestruct.h"

#include "tests/fakes/FakePlatform.h"

#include <cerrno>
#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace welcomer {
namespace {

using Lines = std::vector<std::string>;

class SelfDestructTest : public testing::Test {
  protected:
    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
};

TEST_F(SelfDestructTest, RemovesTheFileNamedAfterTheLabel) {
    fake.fileSystem.addFile("/home/user/Library/LaunchAgents/some.label.plist", "");
    fake.fileSystem.addFile("/home/user/Library/LaunchAgents/other.plist", "");
    selfDestruct("some.label");
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Self destructing..."}));
    EXPECT_EQ(fake.fileSystem.list("/home/user/Library/LaunchAgents"), (Lines{"other.plist"}));
}

TEST_F(SelfDestructTest, TheFirstLineIsLoggedBeforeAnythingIsDone) {
    selfDestruct("some.label");
    EXPECT_EQ(fake.recorder.calls().front(), "SystemLog.write 115, Self destructing...");
}

TEST_F(SelfDestructTest, AFileThatCannotBeRemovedIsLogged) {
    fake.processIdentity.setLoginName("anna");
    fake.fileSystem.fail(fakes::FakeFileSystem::Operation::Remove,
                         "/home/user/Library/LaunchAgents/some.label.plist", EACCES, "no permission");
    selfDestruct("some.label");
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"Self destructing...", "Failed to remove wlnimbussetup plist for anna: no permission"}));
}

TEST_F(SelfDestructTest, AFileThatIsGoneAlreadyIsLoggedToo) {
    selfDestruct("some.label");
    const Lines lines = fake.systemLog.lines();
    ASSERT_EQ(lines.size(), 2U);
    const std::string beginning = "Failed to remove wlnimbussetup plist for user: ";
    EXPECT_EQ(lines[1].substr(0, beginning.size()), beginning);
    EXPECT_GT(lines[1].size(), beginning.size());
}

TEST_F(SelfDestructTest, TheFirstLibraryDirectoryIsTheOne) {
    fake.processIdentity.setUserLibraryDirectories({"/first", "/second"});
    selfDestruct("l");
    EXPECT_EQ(fake.recorder.callsTo("FileSystem."), (Lines{"FileSystem.remove /first/LaunchAgents/l.plist"}));
}

TEST_F(SelfDestructTest, ATildeStandsForTheHomeDirectory) {
    fake.processIdentity.setHomeDirectory("/elsewhere/anna");
    for (const char* directory : {"~/Library", "~", "/a~b/~/Library"}) {
        fake.processIdentity.setUserLibraryDirectories({directory});
        selfDestruct("l");
    }
    EXPECT_EQ(fake.recorder.callsTo("FileSystem."),
              (Lines{"FileSystem.remove /elsewhere/anna/Library/LaunchAgents/l.plist",
                     "FileSystem.remove /elsewhere/anna/LaunchAgents/l.plist",
                     "FileSystem.remove /a~b/~/Library/LaunchAgents/l.plist"}));
}

TEST_F(SelfDestructTest, WithoutLibraryDirectoriesTheHomeDirectorysLibraryIsTheOne) {
    fake.processIdentity.setUserLibraryDirectories({});
    selfDestruct("l");
    EXPECT_EQ(fake.recorder.callsTo("FileSystem."),
              (Lines{"FileSystem.remove /home/user/Library/LaunchAgents/l.plist"}));
}

TEST_F(SelfDestructTest, WithoutAHomeNothingIsTouchedAndTheLineSaysWhy) {
    fake.processIdentity.setLoginName("54321");
    fake.processIdentity.setHomeDirectory("");
    selfDestruct("l");
    EXPECT_EQ(fake.recorder.callsTo("FileSystem."), Lines{});
    EXPECT_EQ(
        fake.systemLog.lines(),
        (Lines{"Self destructing...", "Failed to remove wlnimbussetup plist for 54321: the user 54321 has "
                                      "no home folder"}));
}

TEST_F(SelfDestructTest, ALabelIsTakenAsItStands) {
    selfDestruct("Zo\xC3\xAB %@");
    selfDestruct("");
    EXPECT_EQ(fake.recorder.callsTo("FileSystem."),
              (Lines{"FileSystem.remove /home/user/Library/LaunchAgents/Zo\xC3\xAB %@.plist",
                     "FileSystem.remove /home/user/Library/LaunchAgents/.plist"}));
}

} // namespace
} // namespace welcomer
