// Reading one preference file again and again, whatever became of it in between.

#include "backends/local/DictionaryFile.h"
#include "tests/contract/TemporaryRoot.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <string>

namespace welcomer::local {

namespace {

using State = DictionaryFileContent::State;
using Dictionary = PropertyList::Dictionary;

constexpr char kName[] = "/file.plist";
constexpr char kDamaged[] = "<plist>";
constexpr char kNoDictionary[] = "<plist><true/></plist>";

std::string fileWith(const std::string& text) {
    return "<plist><dict><key>Key</key><string>" + text + "</string></dict></plist>";
}

// Brings the content from any state into any other.
class DictionaryFileTest : public testing::Test {
  protected:
    void reread() { rereadDictionaryFile(posix::RootFolder(root.path()), kName, content); }
    void rereadWith(const std::string& bytes) {
        removeFile();
        root.addFile(kName, bytes);
        reread();
    }
    void removeFile() { std::filesystem::remove(root.locate(kName)); }
    void rereadWithout() {
        removeFile();
        reread();
    }
    void rereadUnreadable() {
        removeFile();
        root.addDirectory(kName);
        reread();
    }

    void expectWhole(const Dictionary& values, const std::string& bytes) {
        EXPECT_EQ(content.state, State::Whole);
        EXPECT_EQ(content.values, values);
        EXPECT_EQ(content.bytes, bytes);
        EXPECT_EQ(content.reason, "");
    }
    void expectNotWhole(State state, const std::string& bytes) {
        EXPECT_EQ(content.state, state);
        EXPECT_EQ(content.values, Dictionary());
        EXPECT_EQ(content.bytes, bytes);
        EXPECT_NE(content.reason, "");
    }

    TemporaryRoot root;
    DictionaryFileContent content;
};

} // namespace

TEST_F(DictionaryFileTest, IsWhatItIsNowAfterEachChange) {
    for (const char* text : {"first", "second", "longer than the ones before it", "x"}) {
        rereadWith(fileWith(text));
        expectWhole({{"Key", text}}, fileWith(text));
    }
}

TEST_F(DictionaryFileTest, IsEmptyOnceItIsGoneAndOnceItIsEmpty) {
    rereadWith(fileWith("first"));
    rereadWith(fileWith("second"));
    rereadWithout();
    expectWhole({}, "");
    rereadWith(fileWith("third"));
    rereadWith("");
    expectWhole({}, "");
}

TEST_F(DictionaryFileTest, IsWholeAgainOnceItsDamageIsMended) {
    rereadWith(fileWith("first"));
    for (const char* damaged : {kDamaged, kNoDictionary}) {
        rereadWith(damaged);
        expectNotWhole(State::Damaged, damaged);
        rereadWith(fileWith("mended"));
        expectWhole({{"Key", "mended"}}, fileWith("mended"));
        rereadWith(damaged);
        rereadWithout();
        expectWhole({}, "");
    }
}

TEST_F(DictionaryFileTest, IsReadAgainOnceItCanBe) {
    for (const std::string& bytes : {fileWith("first"), std::string()}) {
        rereadWith(bytes);
        rereadUnreadable();
        expectNotWhole(State::Unreadable, "");
        rereadWith(fileWith("again"));
        expectWhole({{"Key", "again"}}, fileWith("again"));
        rereadUnreadable();
        rereadWithout();
        expectWhole({}, "");
    }
}

} // namespace welcomer::local
