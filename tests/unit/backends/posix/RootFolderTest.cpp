// Paths below a root folder, looked up by the kernel and by hand.

#include "backends/posix/RootFolder.h"

#include "backends/posix/BelowRoot.h"
#include "tests/contract/TemporaryRoot.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <sys/stat.h>

namespace welcomer::posix {

namespace {

namespace fs = std::filesystem;

FileDescriptor openByHand(int root, const std::string& path, int flags, mode_t mode) {
    return findBelowRoot(root, path, flags, mode).file;
}

struct Way {
    const char* name;
    FileDescriptor (*open)(int root, const std::string& path, int flags, mode_t mode);
};

class BelowRootTest : public testing::TestWithParam<Way> {
  protected:
    BelowRootTest() {
        outside.addFile("/secret", "outside");
        root.addFile("/etc/file", "inside");
        root.addFile("/elsewhere/secret", "inside, too");
        link("/elsewhere", "/var");
        link(outside.path(), "/out");
        link("../../../../../../../.." + outside.path(), "/up");
    }

    void link(const std::string& target, const std::string& path) const {
        fs::create_symlink(target, root.locate(path));
    }
    // The error number of opening a path; 0 when it could be opened.
    int errorOf(const std::string& path, int flags = O_RDONLY) const { return open(path, flags) ? 0 : errno; }
    FileDescriptor open(const std::string& path, int flags, mode_t mode = 0600) const {
        const FileDescriptor folder(::open(root.path().c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
        return GetParam().open(folder.get(), path, flags | O_CLOEXEC, mode);
    }
    std::string contentOf(const std::string& path) const {
        const FileDescriptor file = open(path, O_RDONLY);
        std::string text(100, '\0');
        const ssize_t count = file ? ::read(file.get(), text.data(), text.size()) : -1;
        return count < 0 ? "error " + std::to_string(errno) : text.substr(0, static_cast<std::size_t>(count));
    }

    TemporaryRoot root;
    TemporaryRoot outside;
};

INSTANTIATE_TEST_SUITE_P(Ways, BelowRootTest,
                         testing::Values(Way{"Kernel", openBelowRoot}, Way{"ByHand", openByHand}),
                         [](const auto& each) { return each.param.name; });

} // namespace

TEST_P(BelowRootTest, LinksLeadToWhereTheyLeadInTheSystem) {
    EXPECT_EQ(contentOf("/etc/file"), "inside");
    EXPECT_EQ(contentOf("/var/secret"), "inside, too");
    EXPECT_EQ(contentOf("/etc/../../../var/./secret"), "inside, too");
    link("/etc/file", "/absolute");
    EXPECT_EQ(contentOf("/absolute"), "inside");
    link("../etc/file", "/etc/relative");
    EXPECT_EQ(contentOf("/etc/relative"), "inside");
    link("/absolute", "/etc/twice");
    EXPECT_EQ(contentOf("/etc/twice"), "inside");
}

TEST_P(BelowRootTest, NoLinkLeadsOut) {
    EXPECT_EQ(errorOf("/out/secret"), ENOENT);
    EXPECT_EQ(errorOf("/up/secret"), ENOENT);
    link(outside.locate("/secret"), "/etc/secret");
    EXPECT_EQ(errorOf("/etc/secret"), ENOENT);
    EXPECT_EQ(errorOf("/etc/../../secret"), ENOENT);
}

TEST_P(BelowRootTest, WhatIsMadeIsMadeBelow) {
    EXPECT_TRUE(open("/var/new", O_WRONLY | O_CREAT | O_EXCL));
    EXPECT_EQ(root.content("/elsewhere/new"), "");
    EXPECT_EQ(errorOf("/var/new", O_WRONLY | O_CREAT | O_EXCL), EEXIST);
    EXPECT_EQ(errorOf("/out/new", O_WRONLY | O_CREAT), ENOENT);
    link(outside.locate("/new"), "/etc/new");
    EXPECT_EQ(errorOf("/etc/new", O_WRONLY | O_CREAT | O_EXCL), EEXIST);
    EXPECT_EQ(errorOf("/etc/new", O_WRONLY | O_CREAT), ENOENT);
    EXPECT_EQ(outside.names("/"), std::vector<std::string>{"secret"});
}

TEST_P(BelowRootTest, ALinkAtTheEndIsNotFollowedUnlessAskedFor) {
    EXPECT_EQ(errorOf("/var", O_RDONLY | O_NOFOLLOW), ELOOP);
    const FileDescriptor itself = open("/var", O_PATH | O_NOFOLLOW);
    struct stat status = {};
    ASSERT_EQ(::fstat(itself.get(), &status), 0);
    EXPECT_TRUE(S_ISLNK(status.st_mode));
    EXPECT_EQ(errorOf("/var", O_RDONLY | O_DIRECTORY), 0);
}

TEST_P(BelowRootTest, WhatCannotBeOpenedSaysWhyAsTheSystemDoes) {
    EXPECT_EQ(errorOf("/nowhere/file"), ENOENT);
    EXPECT_EQ(errorOf("/etc/file/more"), ENOTDIR);
    EXPECT_EQ(errorOf("/etc/file/.."), ENOTDIR);
    EXPECT_EQ(errorOf("/etc", O_WRONLY), EISDIR);
    EXPECT_EQ(errorOf("/etc/file", O_RDONLY | O_DIRECTORY), ENOTDIR);
    link("/loop", "/loop");
    EXPECT_EQ(errorOf("/loop"), ELOOP);
    EXPECT_EQ(errorOf("/etc/" + std::string(300, 'x')), ENAMETOOLONG);
}

TEST_P(BelowRootTest, TheRootItselfCanBeOpened) {
    EXPECT_EQ(errorOf("/", O_RDONLY | O_DIRECTORY), 0);
    EXPECT_EQ(errorOf("/..", O_RDONLY | O_DIRECTORY), 0);
    EXPECT_EQ(contentOf("/../etc/file"), "inside");
}

class RootFolderTest : public BelowRootTest {
  protected:
    const RootFolder folder{root.path()};
};
INSTANTIATE_TEST_SUITE_P(Once, RootFolderTest, testing::Values(Way{"Kernel", openBelowRoot}));

TEST_P(RootFolderTest, AnEntryIsThatOfTheFolderBelow) {
    const FolderEntry entry = folder.entry("/var/secret");
    ASSERT_TRUE(entry);
    EXPECT_EQ(::unlinkat(entry.folder(), entry.name(), 0), 0);
    EXPECT_EQ(root.names("/elsewhere"), std::vector<std::string>{});
    EXPECT_FALSE(folder.entry("/out/secret"));
    for (const char* path : {"/", "/..", "/etc/..", "/etc/."}) {
        EXPECT_FALSE(folder.entry(path)) << path;
    }
}

TEST_P(RootFolderTest, AResolvedPathHasNoLinks) {
    EXPECT_EQ(folder.resolve("/var/../var/secret"), root.locate("/elsewhere/secret"));
    EXPECT_EQ(folder.resolve("/"), root.path());
    EXPECT_EQ(folder.resolve("/out/secret"), std::nullopt);
    EXPECT_EQ(RootFolder("/").resolve(root.locate("/etc/../etc/file")),
              fs::canonical(root.locate("/etc/file")).string());
}

TEST_P(RootFolderTest, WithTheWholeMachineLinksAreTheMachines) {
    EXPECT_TRUE(RootFolder("/").exists(root.locate("/out/secret")));
    EXPECT_FALSE(folder.exists("/out/secret"));
    EXPECT_TRUE(folder.exists("/var/secret"));
}

} // namespace welcomer::posix
