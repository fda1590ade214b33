// Credentials survive other processes, failing system calls and kills.

#include "tests/support/FindCredential.h"
#include "tests/support/SystemCallFaults.h"
#include "tests/unit/backends/local/credentials/LocalCredentialStoreFixture.h"

#include <cerrno>
#include <csignal>
#include <sys/wait.h>

namespace welcomer::local {

TEST_F(LocalCredentialStoreWithLibraryTest, OfProcessesThatCreateTheSameItemOneSucceeds) {
    constexpr int kProcesses = 8;
    for (int round = 0; round < 20; ++round) {
        std::filesystem::remove_all(root.locate(kFolder)); // they race for the folder too
        int gate[2] = {};
        ASSERT_EQ(::pipe(gate), 0);
        std::vector<pid_t> children;
        for (int index = 0; index < kProcesses; ++index) {
            const pid_t child = ::fork();
            if (child == 0) {
                ::close(gate[1]);
                char byte = 0;
                const bool opened = ::read(gate[0], &byte, 1) == 0;
                ::_exit(opened ? create("account", std::to_string(::getpid())) : 99);
            }
            children.push_back(child);
        }
        ::close(gate[0]);
        ::close(gate[1]); // all of them start now

        std::optional<std::string> winner;
        for (const pid_t child : children) {
            int status = 0;
            ASSERT_EQ(::waitpid(child, &status, 0), child);
            if (WEXITSTATUS(status) == platform::kCredentialSuccess) {
                EXPECT_EQ(winner, std::nullopt);
                winner = std::to_string(child);
            } else {
                EXPECT_EQ(WEXITSTATUS(status), platform::kCredentialDuplicateItem);
            }
        }
        EXPECT_NE(winner, std::nullopt);
        EXPECT_EQ(secret("account"), winner);
        EXPECT_EQ(deleteItem("account"), 0);
        EXPECT_EQ(root.names(kFolder), Names{});
    }
}

TEST_F(LocalCredentialStoreWithLibraryTest, ProcessesThatCreateDifferentItemsLoseNone) {
    constexpr int kProcesses = 12;
    std::vector<pid_t> children;
    for (int index = 0; index < kProcesses; ++index) {
        const pid_t child = ::fork();
        if (child == 0) {
            ::_exit(create("account " + std::to_string(index), "secret"));
        }
        children.push_back(child);
    }
    for (const pid_t child : children) {
        int status = 0;
        ASSERT_EQ(::waitpid(child, &status, 0), child);
        EXPECT_EQ(WEXITSTATUS(status), platform::kCredentialSuccess);
    }
    for (int index = 0; index < kProcesses; ++index) {
        EXPECT_EQ(secret("account " + std::to_string(index)), "secret") << index;
    }
    expectClean();
}

void LocalCredentialStoreWithLibraryTest::expectAllOrNothingOnFailure(int error, bool otherItem) {
    for (int number = 1;; ++number) {
        std::filesystem::remove_all(root.locate(kFolder));
        ASSERT_TRUE(!otherItem || create("other", "kept") == 0);

        SystemCallFaults::failAt(number, error);
        const std::int32_t status = create("account", kSecret);
        const auto calls = static_cast<int>(SystemCallFaults::stop().size());

        const auto where = testing::Message() << "call " << number << " of " << calls << ", error " << error;
        if (status == platform::kCredentialSuccess) {
            EXPECT_EQ(secret("account"), kSecret) << where;
        } else {
            EXPECT_EQ(statusOf("account"), platform::kCredentialItemNotFound) << where;
            EXPECT_EQ(create("account", kSecret), platform::kCredentialSuccess) << where;
        }
        EXPECT_EQ(secret("other"), otherItem ? std::optional<std::string>("kept") : std::nullopt) << where;
        expectClean();
        if (number > calls) {
            EXPECT_EQ(status, platform::kCredentialSuccess);
            EXPECT_GT(number, 10); // the faults were met
            return;
        }
    }
}

TEST_F(LocalCredentialStoreWithLibraryTest, CreatingTheFirstItemIsAllOrNothingWhicheverCallFails) {
    for (const int error : {ENOSPC, EIO, EACCES, EROFS}) {
        expectAllOrNothingOnFailure(error, false);
    }
}

TEST_F(LocalCredentialStoreWithLibraryTest, CreatingAnotherItemIsAllOrNothingWhicheverCallFails) {
    for (const int error : {ENOSPC, EIO, EACCES, EROFS}) {
        expectAllOrNothingOnFailure(error, true);
    }
}

void LocalCredentialStoreWithLibraryTest::expectAllOrNothingOnCrash(bool otherItem) {
    for (int number = 1;; ++number) {
        std::filesystem::remove_all(root.locate(kFolder));
        ASSERT_TRUE(!otherItem || create("other", "kept") == 0);

        const int end = inChild([&] {
            SystemCallFaults::crashAt(number);
            if (create("account", kSecret) != 0) {
                ::_exit(1);
            }
        });

        const auto where = testing::Message() << "crashed at call " << number;
        ASSERT_TRUE(end == 0 || end == SystemCallFaults::kCrashed) << where << ": " << end;
        const std::int32_t found = statusOf("account");
        if (found == platform::kCredentialSuccess) {
            EXPECT_EQ(secret("account"), kSecret) << where;
        } else {
            EXPECT_EQ(found, platform::kCredentialItemNotFound) << where;
        }
        // The next writer meets whole items alone, and clears away what the dead one left.
        EXPECT_EQ(create("next", "writer"), platform::kCredentialSuccess) << where;
        EXPECT_EQ(statusOf("account"), found) << where;
        EXPECT_EQ(secret("other"), otherItem ? std::optional<std::string>("kept") : std::nullopt) << where;
        expectClean();
        if (end == 0) {
            EXPECT_EQ(found, platform::kCredentialSuccess);
            EXPECT_GT(number, 10);
            return;
        }
    }
}

TEST_F(LocalCredentialStoreWithLibraryTest, CreatingTheFirstItemIsAllOrNothingWhereverTheProcessIsKilled) {
    expectAllOrNothingOnCrash(false);
}

TEST_F(LocalCredentialStoreWithLibraryTest, CreatingAnotherItemIsAllOrNothingWhereverTheProcessIsKilled) {
    expectAllOrNothingOnCrash(true);
}

void LocalCredentialStoreWithLibraryTest::expectDeletionAllOrNothing(bool otherItem) {
    std::unique_ptr<CredentialItemReference> reference;
    for (int number = 1;; ++number) {
        std::filesystem::remove_all(root.locate(kFolder));
        ASSERT_TRUE(!otherItem || create("other", "kept") == 0);
        ASSERT_EQ(create("account", kSecret), 0);
        ASSERT_EQ(findCredential(store, nullptr, &reference), 0);

        SystemCallFaults::failAt(number, ENOSPC);
        const std::int32_t status = store.deleteItem(*reference);
        const auto calls = static_cast<int>(SystemCallFaults::stop().size());

        const auto where = testing::Message() << "call " << number << " of " << calls;
        EXPECT_EQ(secret("account"),
                  status == platform::kCredentialSuccess ? std::nullopt : std::optional(kSecret))
            << where;
        EXPECT_EQ(secret("other"), otherItem ? std::optional<std::string>("kept") : std::nullopt) << where;
        if (number > calls) {
            EXPECT_EQ(status, platform::kCredentialSuccess);
            return;
        }
    }
}

TEST_F(LocalCredentialStoreWithLibraryTest, DeletingIsAllOrNothingWhicheverCallFails) {
    expectDeletionAllOrNothing(false);
    expectDeletionAllOrNothing(true);
}

TEST_F(LocalCredentialStoreWithLibraryTest, AProcessThatIsKilledAtAnyMomentLeavesWholeItems) {
    const std::string large(200000, 'l');
    std::unique_ptr<CredentialItemReference> reference;
    ASSERT_EQ(create("other", "kept"), 0);
    ASSERT_EQ(create("account", large), 0);
    ASSERT_EQ(findCredential(store, nullptr, &reference), 0);
    ASSERT_EQ(store.deleteItem(*reference), 0);
    for (int round = 0; round < 30; ++round) {
        int progress[2] = {};
        ASSERT_EQ(::pipe(progress), 0);
        const pid_t child = ::fork();
        if (child == 0) {
            while (true) {
                const char byte = 0;
                const bool told = ::write(progress[1], &byte, 1) == 1;
                create("account", large);
                if (!told || store.deleteItem(*reference) != 0) {
                    ::_exit(1);
                }
            }
        }
        // Killed while it creates or deletes, a little later in each round.
        ::close(progress[1]);
        char byte = 0;
        for (int count = 0; count <= round % 3; ++count) {
            ASSERT_EQ(::read(progress[0], &byte, 1), 1);
        }
        for (int turn = 0; turn < round; ++turn) {
            ::sched_yield();
        }
        ::kill(child, SIGKILL);
        int status = 0;
        ASSERT_EQ(::waitpid(child, &status, 0), child);
        ::close(progress[0]);
        ASSERT_TRUE(WIFSIGNALED(status)) << "the child failed: " << status;

        const std::int32_t found = statusOf("account");
        ASSERT_TRUE(found == platform::kCredentialItemNotFound || secret("account") == large) << found;
        ASSERT_EQ(secret("other"), "kept");
        if (found == platform::kCredentialSuccess) {
            ASSERT_EQ(store.deleteItem(*reference), 0);
        }
    }
    ASSERT_EQ(create("next", "writer"), 0);
    expectClean();
}

} // namespace welcomer::local
