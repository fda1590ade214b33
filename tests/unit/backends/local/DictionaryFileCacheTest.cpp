#include "backends/local/DictionaryFileCache.h"

#include "propertylist/Lookup.h"
#include "tests/contract/TemporaryRoot.h"

#include <fcntl.h>
#include <filesystem>
#include <gtest/gtest.h>
#include <string>
#include <sys/stat.h>

namespace welcomer::local {
namespace {

using Content = std::shared_ptr<const DictionaryFileContent>;

constexpr char kName[] = "/file.plist";

class DictionaryFileCacheTest : public testing::Test {
  protected:
    void write(const std::string& text) const {
        root.addFile(kName, "<plist><dict><key>Key</key><string>" + text + "</string></dict></plist>");
    }
    // Long after whatever was written.
    Content later() { return cache.content(DictionaryFileCache::WallClock::now() + std::chrono::hours(1)); }
    Content now() { return cache.content(); }
    static std::string text(const Content& content) {
        const std::string* const found = textIn(content->values, "Key");
        return found ? *found : "";
    }

    const TemporaryRoot root;
    DictionaryFileCache cache{posix::RootFolder(root.path()), kName};
};

TEST_F(DictionaryFileCacheTest, AFileThatHasNotChangedIsReadOnce) {
    write("one");
    const Content first = later();
    EXPECT_EQ(text(first), "one");
    EXPECT_EQ(later(), first);
    EXPECT_EQ(first->bytes, "");
}

TEST_F(DictionaryFileCacheTest, OneThatHasJustChangedIsReadAgainSinceItMayChangeOnceMoreAndLookTheSame) {
    write("one");
    const Content first = now();
    EXPECT_NE(now(), first);
}

TEST_F(DictionaryFileCacheTest, WhatIsWrittenOverItCountsEvenWithTheSameLengthAndDate) {
    write("one");
    struct stat before = {};
    ASSERT_EQ(::stat(root.locate(kName).c_str(), &before), 0);
    EXPECT_EQ(text(later()), "one");
    struct stat after = before;
    while (after.st_ctim.tv_sec == before.st_ctim.tv_sec && after.st_ctim.tv_nsec == before.st_ctim.tv_nsec) {
        write("two"); // until the file system's clock has moved on
        const timespec dates[] = {before.st_atim, before.st_mtim};
        ASSERT_EQ(::utimensat(AT_FDCWD, root.locate(kName).c_str(), dates, 0), 0);
        ASSERT_EQ(::stat(root.locate(kName).c_str(), &after), 0);
    }
    EXPECT_EQ(after.st_size, before.st_size);
    EXPECT_EQ(text(later()), "two");
}

TEST_F(DictionaryFileCacheTest, AnotherFileInItsPlaceCounts) {
    write("one");
    EXPECT_EQ(text(later()), "one");
    std::filesystem::rename(root.locate(kName), root.locate("/other"));
    write("two");
    EXPECT_EQ(text(later()), "two");
    std::filesystem::rename(root.locate("/other"), root.locate(kName));
    EXPECT_EQ(text(later()), "one");
}

TEST_F(DictionaryFileCacheTest, AFileThatIsGoneIsAnEmptyOneUntilItIsBack) {
    write("one");
    EXPECT_EQ(text(later()), "one");
    std::filesystem::remove(root.locate(kName));
    const Content gone = later();
    EXPECT_EQ(gone->state, DictionaryFileContent::State::Whole);
    EXPECT_EQ(gone->values, PropertyList::Dictionary());
    write("two");
    EXPECT_EQ(text(later()), "two");
}

TEST_F(DictionaryFileCacheTest, ADamagedFileIsToldAsOftenAsItIsAskedFor) {
    root.addFile(kName, "{");
    EXPECT_EQ(later()->state, DictionaryFileContent::State::Damaged);
    EXPECT_EQ(later()->state, DictionaryFileContent::State::Damaged);
    write("one");
    EXPECT_EQ(text(later()), "one");
}

} // namespace
} // namespace welcomer::local
