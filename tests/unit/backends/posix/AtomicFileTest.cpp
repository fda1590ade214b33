#include "backends/posix/AtomicFile.h"

#include "backends/posix/FileDescriptor.h"
#include "tests/contract/TemporaryRoot.h"

#include <gtest/gtest.h>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace welcomer::posix {
namespace {

TEST(AtomicFile, AFileThatIsReplacedKeepsItsGroup) {
    if (::geteuid() != 0) {
        GTEST_SKIP() << "only root can give a file to any group";
    }
    const TemporaryRoot root;
    root.addFile("/file", "old");
    ASSERT_EQ(::chown(root.locate("/file").c_str(), 0, 31999), 0);
    const FileDescriptor folder(::open(root.path().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    ASSERT_EQ(replaceFile(folder.get(), "file", "new", 0640), 0);
    struct stat status = {};
    ASSERT_EQ(::stat(root.locate("/file").c_str(), &status), 0);
    EXPECT_EQ(status.st_gid, 31999U);
    EXPECT_EQ(status.st_mode & 07777U, 0640U);
    EXPECT_EQ(root.content("/file"), "new");
}

TEST(AtomicFile, ANewFileHasTheGroupOfWhoeverMakesIt) {
    const TemporaryRoot root;
    const FileDescriptor folder(::open(root.path().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    ASSERT_EQ(replaceFile(folder.get(), "file", "new", 0600), 0);
    struct stat status = {};
    ASSERT_EQ(::stat(root.locate("/file").c_str(), &status), 0);
    EXPECT_EQ(status.st_gid, ::getegid());
}

} // namespace
} // namespace welcomer::posix
