#include "tools/launch-agents/LaunchAgentFolder.h"

#include "platform/FileSystem.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakePlatform.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

namespace welcomer::launch {
namespace {

class LaunchAgentFolder : public testing::Test {
  protected:
    LaunchAgentFolder() {
        _root.addDirectory("/agents");
        setMode("", 0755);
    }

    void add(const std::string& name,
             const std::string& content = "{ Label = one; Program = \"/bin/one\"; }") {
        _root.addFile("/agents/" + name, content);
        setMode("/" + name, 0644);
    }
    void setMode(const std::string& name, mode_t mode) {
        ASSERT_EQ(::chmod((folder() + name).c_str(), mode), 0);
    }
    std::string folder() const { return _root.locate("/agents"); }

    std::vector<std::string> labels(uid_t owner = ::geteuid()) {
        std::vector<std::string> found;
        for (const LaunchAgent& agent : readLaunchAgents(folder(), owner)) {
            found.push_back(agent.label);
        }
        return found;
    }
    // Nothing is read, and this is the one line of the log.
    void expectRefused(const std::string& name, const std::string& reason, uid_t owner = ::geteuid()) {
        EXPECT_EQ(labels(owner), std::vector<std::string>());
        EXPECT_EQ(_fake.systemLog.lines(),
                  std::vector<std::string>{"Refusing launch agent " + folder() + name + ": " + reason});
        EXPECT_EQ(_fake.systemLog.records().at(0).priority, 115);
    }

    TemporaryRoot _root;
    fakes::FakePlatform _fake;
    const platform::ScopedPlatform _installed{_fake.platform()};
};

TEST_F(LaunchAgentFolder, IsReadInTheOrderOfTheNames) {
    add("b.plist", "{ Label = two; Program = \"/bin/two\"; }");
    add("a.plist", "{ Label = one; Program = \"/bin/one\"; }");
    add("c.plist", "{ Label = three; Program = \"/bin/three\"; }");
    EXPECT_EQ(labels(), (std::vector<std::string>{"one", "two", "three"}));
    EXPECT_EQ(_fake.systemLog.lines(), std::vector<std::string>());
}

TEST_F(LaunchAgentFolder, IsRidOfCopiesThatWereLeftAndSilentAboutOneThatIsBeingWritten) {
    add("a.plist");
    add(".copy-12");
    add(".copy-34");
    const int writing = ::open((folder() + "/.copy-34").c_str(), O_RDWR | O_CLOEXEC);
    ASSERT_EQ(::flock(writing, LOCK_EX), 0);
    EXPECT_EQ(labels(), std::vector<std::string>{"one"});
    EXPECT_EQ(_fake.systemLog.lines(), std::vector<std::string>());
    EXPECT_NE(::access((folder() + "/.copy-12").c_str(), F_OK), 0);
    EXPECT_EQ(::access((folder() + "/.copy-34").c_str(), F_OK), 0);
    ::close(writing);
}

TEST_F(LaunchAgentFolder, ThatIsMissingHoldsNothing) {
    ASSERT_EQ(::rmdir(folder().c_str()), 0);
    EXPECT_EQ(labels(), std::vector<std::string>());
    EXPECT_EQ(_fake.systemLog.lines(), std::vector<std::string>());
}

TEST_F(LaunchAgentFolder, ThatIsAFileIsRefused) {
    ASSERT_EQ(::rmdir(folder().c_str()), 0);
    _root.addFile("/agents", "");
    expectRefused("", "Not a directory");
}

TEST_F(LaunchAgentFolder, ThatBelongsToAnotherUserIsRefused) {
    add("one.plist");
    expectRefused("", "it belongs to another user", ::geteuid() + 1);
}

TEST_F(LaunchAgentFolder, ThatItsGroupMayWriteToIsRefused) {
    add("one.plist");
    setMode("", 0775);
    expectRefused("", "others may write to it");
}

TEST_F(LaunchAgentFolder, AFileOfAnotherUserIsRefused) {
    if (::geteuid() != 0) {
        GTEST_SKIP() << "giving a file to another user needs the superuser";
    }
    add("one.plist");
    ASSERT_EQ(::chown((folder() + "/one.plist").c_str(), 1, 1), 0);
    expectRefused("/one.plist", "it belongs to another user");
}

TEST_F(LaunchAgentFolder, AFileThatItsGroupMayWriteToIsRefused) {
    add("one.plist");
    setMode("/one.plist", 0664);
    expectRefused("/one.plist", "others may write to it");
}

TEST_F(LaunchAgentFolder, AFileThatEverybodyMayWriteToIsRefused) {
    add("one.plist");
    setMode("/one.plist", 0646);
    expectRefused("/one.plist", "others may write to it");
}

TEST_F(LaunchAgentFolder, AFileThatIsNoPropertyListIsRefused) {
    add("one.plist", "<plist");
    EXPECT_EQ(labels(), std::vector<std::string>());
    ASSERT_EQ(_fake.systemLog.lines().size(), 1u);
    EXPECT_EQ(_fake.systemLog.lines()[0].find("Refusing launch agent " + folder() +
                                              "/one.plist: it is no property list: line 1"),
              0u);
}

TEST_F(LaunchAgentFolder, ABackupOfADefinitionIsRefused) {
    add("one.plist~");
    expectRefused("/one.plist~", "it is no property list by its name");
}

TEST_F(LaunchAgentFolder, ASymbolicLinkIsRefused) {
    _root.addFile("/elsewhere", "{ Label = one; Program = \"/bin/one\"; }");
    ASSERT_EQ(::symlink(_root.locate("/elsewhere").c_str(), (folder() + "/one.plist").c_str()), 0);
    expectRefused("/one.plist", "it is a symbolic link");
}

TEST_F(LaunchAgentFolder, APipeThatNobodyWritesToIsRefusedAtOnce) {
    ASSERT_EQ(::mkfifo((folder() + "/one.plist").c_str(), 0600), 0);
    expectRefused("/one.plist", "it is no regular file");
}

TEST_F(LaunchAgentFolder, AFolderInItIsRefused) {
    _root.addDirectory("/agents/one.plist");
    expectRefused("/one.plist", "it is no regular file");
}

TEST_F(LaunchAgentFolder, AFileThatIsTooLongIsRefused) {
    const std::string definition = "{ Label = one; Program = \"/bin/one\"; }";
    add("one.plist", definition + std::string(platform::kMaximumTextSize - definition.size(), ' '));
    EXPECT_EQ(labels(), std::vector<std::string>{"one"});
    add("one.plist", definition + std::string(platform::kMaximumTextSize - definition.size() + 1, ' '));
    expectRefused("/one.plist", "it is too long");
}

TEST_F(LaunchAgentFolder, TheSecondFileWithALabelIsRefused) {
    add("a.plist", "{ Label = one; Program = \"/bin/first\"; }");
    add("b.plist", "{ Label = one; Program = \"/bin/second\"; }");
    const auto agents = readLaunchAgents(folder(), ::geteuid());
    ASSERT_EQ(agents.size(), 1u);
    EXPECT_EQ(agents[0].program, "/bin/first");
    EXPECT_EQ(_fake.systemLog.lines(),
              std::vector<std::string>{"Refusing launch agent " + folder() +
                                       "/b.plist: an earlier file has the same label"});
}

TEST_F(LaunchAgentFolder, EachRefusalIsALineOfItsOwnAndCostsNoOtherAgent) {
    add("a.plist", "()");
    add("b.plist");
    add("c.txt");
    EXPECT_EQ(labels(), std::vector<std::string>{"one"});
    EXPECT_EQ(_fake.systemLog.lines().size(), 2u);
}

} // namespace
} // namespace welcomer::launch
