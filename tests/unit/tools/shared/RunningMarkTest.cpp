#include "tools/shared/RunningMark.h"

#include "tests/contract/TemporaryRoot.h"

#include <gtest/gtest.h>

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <system_error>
#include <unistd.h>
#include <vector>

namespace welcomer::resolver {

namespace {

class RunningMarkTest : public testing::Test {
  protected:
    bool runs() const { return readRunningMark(path).runs; }

    TemporaryRoot folder;
    const std::string path = folder.locate("/mark");
};

} // namespace

TEST_F(RunningMarkTest, WithoutTheFileNothingRuns) {
    EXPECT_FALSE(runs());
}

TEST_F(RunningMarkTest, AFileThatNobodyHoldsIsNoServiceThatRuns) {
    folder.addFile("/mark", "an old trouble");
    EXPECT_FALSE(runs());
    EXPECT_EQ(readRunningMark(path).trouble, "");
}

TEST_F(RunningMarkTest, TheServiceRunsWhileItHoldsTheFileAndLeavesNothing) {
    {
        const RunningMark mark(path);
        EXPECT_TRUE(runs());
        EXPECT_TRUE(runs()); // asking has changed nothing
    }
    EXPECT_FALSE(runs());
    EXPECT_EQ(folder.content("/mark"), std::nullopt);
}

TEST_F(RunningMarkTest, ASecondServiceIsRefusedAndTheFirstOneStays) {
    const RunningMark mark(path);
    EXPECT_THROW(RunningMark another(path), std::system_error);
    EXPECT_TRUE(runs());
}

TEST_F(RunningMarkTest, AServiceThatDiedIsOverAndTheNextOneTakesItsPlace) {
    const pid_t service = ::fork();
    if (service == 0) {
        auto* const mark = new RunningMark(path);
        mark->note("a trouble");
        ::_exit(readRunningMark(path).runs ? 0 : 1); // without an end of the mark
    }
    int status = -1;
    ASSERT_EQ(::waitpid(service, &status, 0), service);
    ASSERT_EQ(status, 0);
    EXPECT_FALSE(runs());
    const RunningMark mark(path);
    EXPECT_TRUE(runs());
    EXPECT_EQ(readRunningMark(path).trouble, "");
}

TEST_F(RunningMarkTest, WhoLocksTheFileForReadingKeepsNoServiceFromStarting) {
    folder.addFile("/mark", "an old trouble"); // of a service that was killed
    const int file = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
    struct flock lock {};
    lock.l_type = F_RDLCK;
    lock.l_whence = SEEK_SET;
    ASSERT_EQ(::fcntl(file, F_OFD_SETLK, &lock), 0);
    const RunningMark mark(path);
    EXPECT_TRUE(runs());
    EXPECT_EQ(readRunningMark(path).trouble, "");
    ::close(file);
}

TEST_F(RunningMarkTest, EverybodyMayReadTheFileAndNothingElseIsLeft) {
    const RunningMark mark(path);
    struct stat status = {};
    ASSERT_EQ(::stat(path.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, 0644U);
    EXPECT_THROW(RunningMark another(path), std::system_error);
    EXPECT_EQ(folder.names("/"), std::vector<std::string>{"mark"});
}

TEST_F(RunningMarkTest, WhatWasNotedLastIsRead) {
    RunningMark mark(path);
    EXPECT_EQ(readRunningMark(path).trouble, "");
    mark.note("a rather long trouble");
    EXPECT_EQ(readRunningMark(path).trouble, "a rather long trouble");
    mark.note("another");
    EXPECT_EQ(readRunningMark(path).trouble, "another");
    mark.note("");
    EXPECT_EQ(readRunningMark(path).trouble, "");
    EXPECT_TRUE(runs());
}

} // namespace welcomer::resolver
