#include "tools/resolver-sync/FolderWatch.h"

#include "tests/contract/TemporaryRoot.h"

#include <filesystem>
#include <gtest/gtest.h>
#include <poll.h>
#include <system_error>

namespace welcomer::resolver {
namespace {

// What the kernel tells is there once the call that caused it has returned: nothing here waits.
class FolderWatchTest : public testing::Test {
  protected:
    TemporaryRoot _root;
    FolderWatch _watch{_root.locate("/resolver")};
};

TEST_F(FolderWatchTest, TellsOfTheFoldersComing) {
    EXPECT_FALSE(_watch.drain());
    _root.addDirectory("/resolver");
    EXPECT_TRUE(_watch.drain());
    EXPECT_FALSE(_watch.drain());
}

TEST_F(FolderWatchTest, TellsOfTheFoldersGoing) {
    _root.addDirectory("/resolver");
    _watch.rearm();
    _watch.drain();
    std::filesystem::remove(_root.locate("/resolver"));
    EXPECT_TRUE(_watch.drain());
}

TEST_F(FolderWatchTest, TellsOfWritingRenamingAndRemovingInside) {
    _root.addDirectory("/resolver");
    _watch.rearm();
    _watch.drain();
    _root.addFile("/resolver/a", "1");
    EXPECT_TRUE(_watch.drain());
    _root.addFile("/resolver/a", "2");
    EXPECT_TRUE(_watch.drain());
    std::filesystem::rename(_root.locate("/resolver/a"), _root.locate("/resolver/b"));
    EXPECT_TRUE(_watch.drain());
    std::filesystem::remove(_root.locate("/resolver/b"));
    EXPECT_TRUE(_watch.drain());
}

TEST_F(FolderWatchTest, WatchesAFolderThatTookTheOldOnesPlace) {
    _root.addDirectory("/resolver");
    _watch.rearm();
    std::filesystem::rename(_root.locate("/resolver"), _root.locate("/aside"));
    _root.addDirectory("/resolver");
    _watch.rearm();
    _watch.drain();
    _root.addFile("/aside/a", "");
    EXPECT_FALSE(_watch.drain());
    _root.addFile("/resolver/a", "");
    EXPECT_TRUE(_watch.drain());
}

TEST_F(FolderWatchTest, SaysNothingOfItsNeighbours) {
    _root.addFile("/hosts", "");
    _root.addDirectory("/resolver.d");
    EXPECT_FALSE(_watch.drain());
}

TEST_F(FolderWatchTest, IsReadableOnlyWhileThereIsSomethingToTell) {
    pollfd readable{_watch.descriptor(), POLLIN, 0};
    EXPECT_EQ(::poll(&readable, 1, 0), 0);
    _root.addDirectory("/resolver");
    EXPECT_EQ(::poll(&readable, 1, 0), 1);
}

TEST(FolderWatchInNoFolder, CannotBeMade) {
    EXPECT_THROW(FolderWatch("/missing/folder/resolver"), std::system_error);
}

} // namespace
} // namespace welcomer::resolver
