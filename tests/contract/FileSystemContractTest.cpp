// What every file system must do.

#include "backends/local/LocalFileSystem.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeFileSystem.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <sys/stat.h>

namespace welcomer::contract {

namespace {

using Names = std::vector<std::string>;

struct LocalFiles {
    TemporaryRoot root;
    local::LocalFileSystem fileSystem{posix::RootFolder(root.path())};

    void addDirectory(const std::string& path) const { root.addDirectory(path); }
    void addFile(const std::string& path, const std::string& content, mode_t mode) const {
        root.addFile(path, content);
        ::chmod(root.locate(path).c_str(), mode);
    }
    void addSymbolicLink(const std::string& path, const std::string& target) const {
        std::filesystem::create_symlink(target, root.locate(path));
    }
    std::optional<std::string> content(const std::string& path) const { return root.content(path); }
    std::optional<mode_t> mode(const std::string& path) const {
        struct stat status = {};
        return ::stat(root.locate(path).c_str(), &status) == 0 ? std::optional(status.st_mode & 07777U)
                                                               : std::nullopt;
    }
};

struct FakeFiles {
    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem{recorder};

    void addDirectory(const std::string& path) { fileSystem.addDirectory(path); }
    void addFile(const std::string& path, const std::string& content, mode_t mode) {
        fileSystem.addFile(path, content, mode);
    }
    void addSymbolicLink(const std::string& path, const std::string& target) {
        fileSystem.addSymbolicLink(path, target);
    }
    std::optional<std::string> content(const std::string& path) const { return fileSystem.content(path); }
    std::optional<mode_t> mode(const std::string& path) const { return fileSystem.mode(path); }
};

struct BackendNames {
    template <typename Backend>
    static std::string GetName(int) {
        return std::is_same_v<Backend, LocalFiles> ? "Local" : "Fake";
    }
};

template <typename Backend>
class FileSystemContract : public testing::Test {
  protected:
    // The names in a folder, sorted.
    Names names(const std::string& path) {
        Names found = this->files.fileSystem.list(path).value_or(Names{"no folder"});
        std::sort(found.begin(), found.end());
        return found;
    }

    Backend files;
};

using Backends = testing::Types<LocalFiles, FakeFiles>;
TYPED_TEST_SUITE(FileSystemContract, Backends, BackendNames);

} // namespace

TYPED_TEST(FileSystemContract, ExistsForFilesAndFoldersAlone) {
    this->files.addFile("/folder/file", "text", 0644);

    EXPECT_TRUE(this->files.fileSystem.exists("/folder"));
    EXPECT_TRUE(this->files.fileSystem.exists("/folder/file"));
    EXPECT_FALSE(this->files.fileSystem.exists("/folder/other"));
    EXPECT_FALSE(this->files.fileSystem.exists("/folder/file/below"));
}

TYPED_TEST(FileSystemContract, ASymbolicLinkExistsAsFarAsItsTargetDoes) {
    this->files.addFile("/folder/file", "text", 0644);
    this->files.addSymbolicLink("/folder/link", "file");
    this->files.addSymbolicLink("/folder/dangling", "nothing");

    EXPECT_TRUE(this->files.fileSystem.exists("/folder/link"));
    EXPECT_FALSE(this->files.fileSystem.exists("/folder/dangling"));
}

TYPED_TEST(FileSystemContract, RemovesAFile) {
    this->files.addFile("/folder/file", "text", 0644);
    this->files.addFile("/folder/other", "text", 0644);

    EXPECT_TRUE(this->files.fileSystem.remove("/folder/file"));
    EXPECT_EQ(this->names("/folder"), Names{"other"});
}

TYPED_TEST(FileSystemContract, RemovesAFolderWithAllThatIsInIt) {
    this->files.addFile("/folder/one/two/file", "text", 0644);
    this->files.addFile("/folder/one/file", "text", 0644);
    this->files.addSymbolicLink("/folder/one/dangling", "nothing");

    EXPECT_TRUE(this->files.fileSystem.remove("/folder/one"));
    EXPECT_EQ(this->names("/folder"), Names{});
}

TYPED_TEST(FileSystemContract, RemovingASymbolicLinkLeavesItsTarget) {
    this->files.addFile("/target/file", "text", 0644);
    this->files.addDirectory("/folder/below");
    this->files.addSymbolicLink("/folder/toFolder", "../target");
    this->files.addSymbolicLink("/folder/toFolderToo", "../target");
    this->files.addSymbolicLink("/folder/toFile", "../target/file");
    this->files.addSymbolicLink("/folder/dangling", "nothing");
    this->files.addSymbolicLink("/folder/below/link", "../../target");

    EXPECT_TRUE(this->files.fileSystem.remove("/folder/toFolder"));
    EXPECT_TRUE(this->files.fileSystem.remove("/folder/toFolderToo/"));
    EXPECT_TRUE(this->files.fileSystem.remove("/folder/toFile"));
    EXPECT_TRUE(this->files.fileSystem.remove("/folder/dangling"));
    EXPECT_TRUE(this->files.fileSystem.remove("/folder"));
    EXPECT_EQ(this->files.content("/target/file"), "text");
}

TYPED_TEST(FileSystemContract, RemovingWhatIsNotThereFailsAndSaysSo) {
    this->files.addDirectory("/folder");

    const platform::Outcome outcome = this->files.fileSystem.remove("/folder/file");

    EXPECT_FALSE(outcome);
    EXPECT_EQ(outcome.error.number, ENOENT);
    EXPECT_EQ(outcome.error.message, "cannot remove /folder/file: No such file or directory");
}

TYPED_TEST(FileSystemContract, CreatesAFolderWithItsMode) {
    EXPECT_TRUE(this->files.fileSystem.createDirectory("/open", 0755));
    EXPECT_TRUE(this->files.fileSystem.createDirectory("/closed", 0700));

    EXPECT_EQ(this->files.mode("/open"), 0755U);
    EXPECT_EQ(this->files.mode("/closed"), 0700U);
    EXPECT_EQ(this->names("/open"), Names{});
}

TYPED_TEST(FileSystemContract, CreatesNoParentsOfAFolder) {
    const platform::Outcome outcome = this->files.fileSystem.createDirectory("/folder/below", 0755);

    EXPECT_FALSE(outcome);
    EXPECT_EQ(outcome.error.number, ENOENT);
    EXPECT_EQ(outcome.error.message, "cannot create /folder/below: No such file or directory");
    EXPECT_FALSE(this->files.fileSystem.exists("/folder"));
}

TYPED_TEST(FileSystemContract, CreatesNoFolderWhereAnythingIs) {
    this->files.addFile("/file", "text", 0644);
    this->files.addDirectory("/folder");
    this->files.addSymbolicLink("/dangling", "nothing");

    EXPECT_EQ(this->files.fileSystem.createDirectory("/file", 0700).error.number, EEXIST);
    EXPECT_EQ(this->files.fileSystem.createDirectory("/folder", 0700).error.number, EEXIST);
    EXPECT_EQ(this->files.fileSystem.createDirectory("/dangling", 0700).error.number, EEXIST);
    EXPECT_EQ(this->files.mode("/folder"), 0755U);
    EXPECT_EQ(this->files.fileSystem.createDirectory("/file/below", 0700).error.number, ENOTDIR);
}

TYPED_TEST(FileSystemContract, CopiesContentAndPermissions) {
    const std::string content = std::string(300000, 'x') + std::string("\0end", 4);
    this->files.addFile("/from/file", content, 0640);
    this->files.addDirectory("/to");

    EXPECT_TRUE(this->files.fileSystem.copy("/from/file", "/to/copy"));
    EXPECT_EQ(this->files.content("/to/copy"), content);
    EXPECT_EQ(this->files.mode("/to/copy"), 0640U);
    EXPECT_EQ(this->files.content("/from/file"), content);
    EXPECT_EQ(this->names("/to"), Names{"copy"});
}

TYPED_TEST(FileSystemContract, CopiesAnEmptyFileAndWhatASymbolicLinkPointsTo) {
    this->files.addFile("/from/empty", "", 0600);
    this->files.addSymbolicLink("/from/link", "empty");

    EXPECT_TRUE(this->files.fileSystem.copy("/from/link", "/from/copy"));
    EXPECT_EQ(this->files.content("/from/copy"), "");
    EXPECT_EQ(this->files.mode("/from/copy"), 0600U);
}

TYPED_TEST(FileSystemContract, CopiesOverNothing) {
    this->files.addFile("/from/file", "new", 0600);
    this->files.addFile("/to/file", "old", 0644);
    this->files.addDirectory("/to/folder");
    this->files.addSymbolicLink("/to/dangling", "nothing");

    const platform::Outcome outcome = this->files.fileSystem.copy("/from/file", "/to/file");

    EXPECT_FALSE(outcome);
    EXPECT_EQ(outcome.error.number, EEXIST);
    EXPECT_EQ(outcome.error.message, "cannot copy /from/file to /to/file: File exists");
    EXPECT_EQ(this->files.fileSystem.copy("/from/file", "/to/folder").error.number, EEXIST);
    EXPECT_EQ(this->files.fileSystem.copy("/from/file", "/to/dangling").error.number, EEXIST);
    EXPECT_EQ(this->files.content("/to/file"), "old");
    EXPECT_EQ(this->files.mode("/to/file"), 0644U);
    EXPECT_EQ(this->names("/to"), (Names{"dangling", "file", "folder"}));
    EXPECT_FALSE(this->files.fileSystem.exists("/to/nothing"));
}

TYPED_TEST(FileSystemContract, ACopyWithoutASourceOrAFolderFails) {
    this->files.addFile("/from/file", "text", 0644);
    this->files.addDirectory("/to");

    EXPECT_EQ(this->files.fileSystem.copy("/from/other", "/to/copy").error.number, ENOENT);
    EXPECT_EQ(this->files.fileSystem.copy("/from", "/to/copy").error.number, EISDIR);
    EXPECT_EQ(this->files.fileSystem.copy("/from/file", "/elsewhere/copy").error.number, ENOENT);
    EXPECT_EQ(this->files.fileSystem.copy("/from/file", "/from/file/copy").error.number, ENOTDIR);
    EXPECT_EQ(this->names("/to"), Names{});
    EXPECT_EQ(this->names("/from"), Names{"file"});
}

TYPED_TEST(FileSystemContract, ListsEveryEntryOfAFolder) {
    this->files.addFile("/folder/file", "text", 0644);
    this->files.addFile("/folder/.hidden", "text", 0644);
    this->files.addFile("/folder/below/deeper", "text", 0644);
    this->files.addSymbolicLink("/folder/dangling", "nothing");

    EXPECT_EQ(this->names("/folder"), (Names{".hidden", "below", "dangling", "file"}));
    EXPECT_EQ(this->names("/folder/below"), Names{"deeper"});
}

TYPED_TEST(FileSystemContract, ListsNothingWhereNoFolderIs) {
    this->files.addFile("/file", "text", 0644);

    EXPECT_EQ(this->files.fileSystem.list("/file"), std::nullopt);
    EXPECT_EQ(this->files.fileSystem.list("/missing"), std::nullopt);
}

} // namespace welcomer::contract
