// Work in a process of its own.

#include "backends/posix/OwnProcess.h"

#include <gtest/gtest.h>

#include <csignal>
#include <stdexcept>
#include <unistd.h>

namespace welcomer::posix {
namespace {

TEST(OwnProcess, ItSaysWhetherTheWorkSucceeds) {
    EXPECT_TRUE(succeedsInAProcessOfItsOwn([] { return true; }));
    EXPECT_FALSE(succeedsInAProcessOfItsOwn([] { return false; }));
    EXPECT_FALSE(succeedsInAProcessOfItsOwn([]() -> bool { throw std::runtime_error("no"); }));
    EXPECT_FALSE(succeedsInAProcessOfItsOwn([] { return ::kill(::getpid(), SIGKILL) == 1; }));
}

TEST(OwnProcess, WhatTheWorkWritesIsNotInThisOne) {
    int written = 1;
    EXPECT_TRUE(succeedsInAProcessOfItsOwn([&written, here = ::getpid()] {
        written = 2;
        return ::getpid() != here;
    }));
    EXPECT_EQ(written, 1);
}

TEST(OwnProcess, SomebodyElseMayHaveWaitedForIt) {
    ::signal(SIGCHLD, SIG_IGN); // the system itself does
    EXPECT_TRUE(succeedsInAProcessOfItsOwn([] { return true; }));
    ::signal(SIGCHLD, SIG_DFL);
}

} // namespace
} // namespace welcomer::posix
