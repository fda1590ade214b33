// Credentials on full and read-only disks, and on mount points.

#include "tests/support/MountNamespace.h"
#include "tests/support/SystemCallFaults.h"
#include "tests/unit/backends/local/credentials/LocalCredentialStoreFixture.h"

#include <algorithm>
#include <cerrno>
#include <fstream>

namespace welcomer::local {

// The tests below give the process file systems of its own.
class LocalCredentialStoreOnDiskTest : public LocalCredentialStoreTest {
  protected:
    void SetUp() override {
        if (!mayMount()) {
            GTEST_SKIP() << "needs the right to mount";
        }
        enterMountNamespace();
        mountMemory(root.locate(kHome), "256k");
        root.addDirectory(kLibrary);
    }
    void TearDown() override { unmount(root.locate(kHome)); }
};

TEST_F(LocalCredentialStoreOnDiskTest, AFullDiskKeepsWhatWasThere) {
    ASSERT_EQ(create("other", "kept"), 0);

    EXPECT_EQ(create("account", std::string(300000, 'x')), platform::kCredentialWriteFailed);
    EXPECT_EQ(statusOf("account"), platform::kCredentialItemNotFound);
    EXPECT_EQ(secret("other"), "kept");
    expectClean();
    EXPECT_EQ(create("account", "fits"), 0);
}

TEST_F(LocalCredentialStoreOnDiskTest, TheLastItemCanBeDeletedFromAFullDisk) {
    ASSERT_EQ(create("account", "secret"), 0);
    std::ofstream(root.locate("/home/user/filler")) << std::string(300000, 'x');

    EXPECT_EQ(create("other", std::string(20000, 'x')), platform::kCredentialWriteFailed);
    EXPECT_EQ(deleteItem("account"), 0);
    EXPECT_EQ(root.names(kFolder), Names{});
}

TEST_F(LocalCredentialStoreOnDiskTest, AReadOnlyHomeIsReadAndNotWritten) {
    makeReadOnly(root.locate(kHome));
    EXPECT_EQ(create("account", "secret"), platform::kCredentialWriteFailed);
    EXPECT_EQ(statusOf("account"), platform::kCredentialItemNotFound);

    makeReadOnly(root.locate(kHome), false);
    ASSERT_EQ(create("account", "secret"), 0);
    makeReadOnly(root.locate(kHome));
    EXPECT_EQ(secret("account"), "secret");
    EXPECT_EQ(create("other", "secret"), platform::kCredentialWriteFailed);
    EXPECT_EQ(create("account", "secret"), platform::kCredentialDuplicateItem);
    EXPECT_EQ(deleteItem("account"), platform::kCredentialWriteFailed);
    EXPECT_EQ(secret("account"), "secret");
}

TEST_F(LocalCredentialStoreOnDiskTest, AFileThatIsAMountPointIsRewrittenInPlace) {
    ASSERT_EQ(create("one", std::string(5000, '1')), 0);
    mountOnItself(root.locate(kFile));

    EXPECT_EQ(create("two", "second"), 0);
    EXPECT_EQ(secret("one"), std::string(5000, '1'));
    EXPECT_EQ(secret("two"), "second");
    EXPECT_EQ(deleteItem("one"), 0);
    EXPECT_EQ(secret("two"), "second");
    EXPECT_EQ(deleteItem("two"), 0);
    EXPECT_EQ(statusOf("two"), platform::kCredentialItemNotFound);
    expectClean();
    EXPECT_EQ(create("three", "third"), 0);
    EXPECT_EQ(secret("three"), "third");
    unmount(root.locate(kFile));
}

TEST_F(LocalCredentialStoreOnDiskTest, AMountPointWhoseSpaceCannotBeReservedKeepsItsContent) {
    ASSERT_EQ(create("one", "first"), 0);
    mountOnItself(root.locate(kFile));
    const std::string before = root.content(kFile).value_or("");
    SystemCallFaults::count();
    ASSERT_EQ(create("two", "second"), 0);
    const Names calls = SystemCallFaults::stop();
    const auto reservation = std::find(calls.begin(), calls.end(), "posix_fallocate");
    ASSERT_NE(reservation, calls.end());
    ASSERT_EQ(deleteItem("two"), 0);
    ASSERT_EQ(root.content(kFile), before);

    SystemCallFaults::failAt(static_cast<int>(reservation - calls.begin()) + 1, ENOSPC);
    const std::int32_t status = create("two", "second");
    SystemCallFaults::stop();

    EXPECT_EQ(status, platform::kCredentialWriteFailed);
    EXPECT_EQ(root.content(kFile), before);
    expectClean();
    unmount(root.locate(kFile));
}

TEST_F(LocalCredentialStoreOnDiskTest, AMountPointOnAFullDiskKeepsItsContent) {
    ASSERT_EQ(create("one", "first"), 0);
    mountOnItself(root.locate(kFile));
    const std::string before = root.content(kFile).value_or("");

    // Fits once beside the old content, but not twice.
    EXPECT_EQ(create("two", std::string(120000, '2')), platform::kCredentialWriteFailed);
    EXPECT_EQ(root.content(kFile), before);
    expectClean();
    unmount(root.locate(kFile));
}

} // namespace welcomer::local
