#include "tools/resolver-sync/FolderWatch.h"

#include "tests/contract/TemporaryRoot.h"

#include <filesystem>
#include <gtest/gtest.h>
#include <optional>
#include <system_error>
#include <systemd/sd-event.h>
#include <utility>

namespace welcomer::resolver {
namespace {

sd_event* newEvent() {
    sd_event* event = nullptr;
    sd_event_new(&event);
    return event;
}

// What the kernel tells is there once the call that caused it has returned: nothing here waits.
class FolderWatchTest : public testing::Test {
  protected:
    ~FolderWatchTest() override {
        _watch.reset();
        sd_event_unref(_event);
    }

    // Whether anything was told since the last call.
    bool tells() {
        _told = false;
        while (sd_event_run(_event, 0) > 0) {
        }
        return _told;
    }

    TemporaryRoot _root;
    sd_event* _event = newEvent();
    bool _told = false;
    std::optional<FolderWatch> _watch{std::in_place, _event, _root.locate("/resolver"), [this] {
                                          _told = true;
                                      }};
};

TEST_F(FolderWatchTest, TellsOfTheFoldersComing) {
    EXPECT_FALSE(tells());
    _root.addDirectory("/resolver");
    EXPECT_TRUE(tells());
    EXPECT_FALSE(tells());
}

TEST_F(FolderWatchTest, TellsOfTheFoldersGoing) {
    _root.addDirectory("/resolver");
    _watch->rearm();
    tells();
    std::filesystem::remove(_root.locate("/resolver"));
    EXPECT_TRUE(tells());
}

TEST_F(FolderWatchTest, TellsOfWritingRenamingAndRemovingInside) {
    _root.addDirectory("/resolver");
    _watch->rearm();
    tells();
    _root.addFile("/resolver/a", "1");
    EXPECT_TRUE(tells());
    _root.addFile("/resolver/a", "2");
    EXPECT_TRUE(tells());
    std::filesystem::rename(_root.locate("/resolver/a"), _root.locate("/resolver/b"));
    EXPECT_TRUE(tells());
    std::filesystem::remove(_root.locate("/resolver/b"));
    EXPECT_TRUE(tells());
}

TEST_F(FolderWatchTest, WatchesAFolderThatTookTheOldOnesPlace) {
    _root.addDirectory("/resolver");
    _watch->rearm();
    std::filesystem::rename(_root.locate("/resolver"), _root.locate("/aside"));
    _root.addDirectory("/resolver");
    _watch->rearm();
    tells();
    _root.addFile("/aside/a", "");
    EXPECT_FALSE(tells());
    _root.addFile("/resolver/a", "");
    EXPECT_TRUE(tells());
}

TEST_F(FolderWatchTest, SaysNothingOfItsNeighbours) {
    _root.addFile("/hosts", "");
    _root.addDirectory("/resolver.d");
    EXPECT_FALSE(tells());
}

TEST_F(FolderWatchTest, WakesNobodyWhileThereIsNothingToTell) {
    while (sd_event_run(_event, 0) > 0) {
    }
    EXPECT_EQ(sd_event_run(_event, 0), 0);
    _root.addDirectory("/resolver");
    EXPECT_GT(sd_event_run(_event, 0), 0);
}

TEST_F(FolderWatchTest, CannotBeMadeInNoFolder) {
    EXPECT_THROW(FolderWatch(_event, "/missing/folder/resolver", [] {}), std::system_error);
}

} // namespace
} // namespace welcomer::resolver
