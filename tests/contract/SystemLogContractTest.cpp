// What every system log must do.

#include "backends/local/LocalSystemLog.h"
#include "tests/fakes/FakeSystemLog.h"
#include "tests/support/SystemLogSocket.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <thread>

namespace welcomer::contract {

namespace {

using Record = fakes::FakeSystemLog::Record;

struct LocalLog {
    SystemLogSocket socket;
    local::LocalSystemLog log;

    std::vector<Record> records() {
        std::vector<Record> records;
        for (const SystemLogSocket::Record& record : socket.take()) {
            records.push_back({record.priority, record.message});
        }
        return records;
    }
};

struct FakeLog {
    fakes::CallRecorder recorder;
    fakes::FakeSystemLog log{recorder};

    std::vector<Record> records() const { return log.records(); }
};

struct BackendNames {
    template <typename Backend>
    static std::string GetName(int) {
        return std::is_same_v<Backend, LocalLog> ? "Local" : "Fake";
    }
};

template <typename Backend>
class SystemLogContract : public testing::Test {
  protected:
    void SetUp() override {
        if (std::is_same_v<Backend, LocalLog> && !SystemLogSocket::isPossible()) {
            GTEST_SKIP() << "a log socket of the test's own needs the right to mount";
        }
        backend.emplace();
    }

    std::optional<Backend> backend;
};

using Backends = testing::Types<LocalLog, FakeLog>;
TYPED_TEST_SUITE(SystemLogContract, Backends, BackendNames);

} // namespace

TYPED_TEST(SystemLogContract, ARecordCarriesItsPriorityAndItsTextAsTheyStand) {
    this->backend->log.write(115, "first, 100%d of %s and %n");
    this->backend->log.write(119, "");
    this->backend->log.write(115, "caf\u00e9 \u4e16");

    EXPECT_EQ(
        this->backend->records(),
        (std::vector<Record>{{115, "first, 100%d of %s and %n"}, {119, ""}, {115, "caf\u00e9 \u4e16"}}));
}

TYPED_TEST(SystemLogContract, ALongRecordIsWhole) {
    const std::string text(50000, 'x');

    this->backend->log.write(115, text);

    EXPECT_EQ(this->backend->records(), (std::vector<Record>{{115, text}}));
}

TYPED_TEST(SystemLogContract, RecordsOfSeveralThreadsDoNotInterleave) {
    std::vector<std::thread> threads;
    std::vector<Record> expected;
    for (char letter = 'a'; letter < 'e'; ++letter) {
        const std::string text(500, letter);
        expected.push_back({115, text});
        threads.emplace_back([this, text] { this->backend->log.write(115, text); });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }

    std::vector<Record> records = this->backend->records();
    std::sort(records.begin(), records.end(),
              [](const Record& left, const Record& right) { return left.message < right.message; });
    EXPECT_EQ(records, expected);
}

} // namespace welcomer::contract
