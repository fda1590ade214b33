#include "tools/welcomer/story/FolderSnapshot.h"

#include "tools/welcomer/story/TemporaryFolder.h"

#include <fstream>
#include <gtest/gtest.h>

namespace welcomer::tool {
namespace {

namespace fs = std::filesystem;

class FolderSnapshotTest : public testing::Test {
  protected:
    FolderSnapshotTest() {
        fs::create_directory(path("below"));
        write("below/file", "one");
    }

    fs::path path(const std::string& name) const { return _folder.path() / name; }
    void write(const std::string& name, const std::string& text) const { std::ofstream(path(name)) << text; }

  private:
    TemporaryFolder _folder;
};

using Paths = std::vector<std::string>;

TEST_F(FolderSnapshotTest, NothingHasChangedAtFirst) {
    EXPECT_EQ(FolderSnapshot(path("")).changesUntilNow(), Paths{});
}

TEST_F(FolderSnapshotTest, AWrittenFileIsAChange) {
    const FolderSnapshot snapshot(path(""));
    const auto written = fs::last_write_time(path("below/file"));
    write("below/file", "three");
    fs::last_write_time(path("below/file"), written); // the size alone tells
    EXPECT_EQ(snapshot.changesUntilNow(), Paths{"below/file"});
}

TEST_F(FolderSnapshotTest, AFileRewrittenInTheSameSizeIsAChange) {
    const FolderSnapshot snapshot(path(""));
    fs::last_write_time(path("below/file"),
                        fs::last_write_time(path("below/file")) + std::chrono::seconds(1));
    EXPECT_EQ(snapshot.changesUntilNow(), Paths{"below/file"});
}

TEST_F(FolderSnapshotTest, AnAddedFileIsAChangeOfItsFolderToo) {
    const FolderSnapshot snapshot(path(""));
    write("below/new", "");
    fs::last_write_time(path("below"), fs::last_write_time(path("below")) + std::chrono::seconds(1));
    EXPECT_EQ(snapshot.changesUntilNow(), (Paths{"below", "below/new"}));
}

TEST_F(FolderSnapshotTest, ARemovedFileIsAChange) {
    const FolderSnapshot snapshot(path(""));
    const auto written = fs::last_write_time(path("below"));
    fs::remove(path("below/file"));
    fs::last_write_time(path("below"), written);
    EXPECT_EQ(snapshot.changesUntilNow(), Paths{"below/file"});
}

TEST_F(FolderSnapshotTest, OtherPermissionsAreAChange) {
    const FolderSnapshot snapshot(path(""));
    fs::permissions(path("below/file"), fs::perms::owner_read);
    EXPECT_EQ(snapshot.changesUntilNow(), Paths{"below/file"});
}

TEST_F(FolderSnapshotTest, ADanglingLinkIsNoObstacle) {
    fs::create_symlink("nowhere", path("link"));
    EXPECT_EQ(FolderSnapshot(path("")).changesUntilNow(), Paths{});
}

} // namespace
} // namespace welcomer::tool
