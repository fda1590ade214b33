#include "log/PCLogManager.h"

#include "tests/fakes/FakePlatform.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <limits>
#include <map>
#include <string>
#include <thread>
#include <vector>

namespace welcomer {

// Outside the unnamed namespace, so that their signatures read as in the system's own code.
int logFromAFunction(int, bool) {
    WL_LOG("told by %@", "a function");
    return __LINE__ - 1;
}

void logUnderAFixedName() {
    WL_LOG_AS("void fixed(void)", "%ld aliases", 2L);
}

namespace {

using Records = std::vector<fakes::FakeSystemLog::Record>;

class PCLogManagerTest : public testing::Test {
  protected:
    void log(std::int32_t type, const std::string& message) {
        PCLogManager::sharedManager().logTypeInFunctionAtLineWithString(type, "void f()", 7, message);
    }

    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
};

TEST_F(PCLogManagerTest, TheSharedManagerIsAlwaysTheSame) {
    EXPECT_EQ(&PCLogManager::sharedManager(), &PCLogManager::sharedManager());
}

TEST_F(PCLogManagerTest, TheSharedManagerIsMadeOnceByManyThreads) {
    constexpr int count = 8;
    std::vector<PCLogManager*> seen(count);
    std::vector<std::thread> threads;
    for (int i = 0; i < count; ++i) {
        threads.emplace_back(
            [&seen, i] { seen[static_cast<std::size_t>(i)] = &PCLogManager::sharedManager(); });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(std::count(seen.begin(), seen.end(), &PCLogManager::sharedManager()), count);
}

TEST_F(PCLogManagerTest, TypeOneIsWrittenWithFacilityFourteenAndSeverityError) {
    log(1, "normal");
    EXPECT_EQ(fake.systemLog.records(), (Records{{115, "normal"}}));
}

TEST_F(PCLogManagerTest, TypeZeroIsWrittenWithFacilityFourteenAndSeverityDebug) {
    log(0, "debug");
    EXPECT_EQ(fake.systemLog.records(), (Records{{119, "debug"}}));
}

TEST_F(PCLogManagerTest, AnyOtherTypeWritesNothing) {
    for (const std::int32_t type : {2, 3, -1, 115, 119, 256, 257, std::numeric_limits<std::int32_t>::min(),
                                    std::numeric_limits<std::int32_t>::max()}) {
        log(type, "unheard");
    }
    EXPECT_EQ(fake.recorder.calls(), std::vector<std::string>{});
}

TEST_F(PCLogManagerTest, PercentSignsInTheMessageAreWrittenAsTheyStand) {
    const std::string message = "%d %@ %s %n %% 100%";
    log(1, message);
    EXPECT_EQ(fake.systemLog.records(), (Records{{115, message}}));
}

TEST_F(PCLogManagerTest, AnEmptyMessageIsOneEmptyRecord) {
    log(1, "");
    EXPECT_EQ(fake.systemLog.records(), (Records{{115, ""}}));
}

TEST_F(PCLogManagerTest, UTF8IsWrittenAsItStands) {
    log(1, "gr\xC3\xBC\xC3\x9F dich \xE2\x82\xAC");
    EXPECT_EQ(fake.systemLog.records(), (Records{{115, "gr\xC3\xBC\xC3\x9F dich \xE2\x82\xAC"}}));
}

TEST_F(PCLogManagerTest, TheRecordIsTheMessageAlone) {
    logFromAFunction(0, false);
    EXPECT_EQ(fake.systemLog.records(), (Records{{115, "told by a function"}}));
}

TEST_F(PCLogManagerTest, EachCallIsOneRecordAtOnce) {
    log(1, "first");
    EXPECT_EQ(fake.systemLog.lines().size(), 1U);
    log(1, "first");
    EXPECT_EQ(fake.systemLog.lines().size(), 2U);
}

TEST_F(PCLogManagerTest, TheFormatFormWritesTheFormattedMessage) {
    PCLogManager::sharedManager().logTypeInFunctionAtLineWithFormat(0, "void f()", 7, "%@ of %d", "one", 2);
    PCLogManager::sharedManager().logTypeInFunctionAtLineWithFormat(2, "void f()", 7, "%@ of %d", "one", 2);
    EXPECT_EQ(fake.systemLog.records(), (Records{{119, "one of 2"}}));
}

TEST_F(PCLogManagerTest, AnArgumentIsNeverAFormatItself) {
    WL_LOG("%@", "%d%@");
    EXPECT_EQ(fake.systemLog.records(), (Records{{115, "%d%@"}}));
}

TEST_F(PCLogManagerTest, AnObserverSeesSignatureLineAndType) {
    std::vector<std::string> calls;
    PCLogManager::sharedManager().setObserver([&](const PCLogManager::Call& call) {
        calls.push_back(std::to_string(call.type) + '|' + call.function + '|' + std::to_string(call.line) +
                        '|' + call.message);
    });
    const int line = logFromAFunction(0, false);
    logUnderAFixedName();
    log(2, "unheard");
    PCLogManager::sharedManager().setObserver({});
    log(1, "unobserved");

    ASSERT_EQ(calls.size(), 3U);
    EXPECT_EQ(calls[0],
              "1|int welcomer::logFromAFunction(int, bool)|" + std::to_string(line) + "|told by a function");
    EXPECT_EQ(calls[1].substr(0, 19), "1|void fixed(void)|");
    EXPECT_EQ(calls[2], "2|void f()|7|unheard");
    EXPECT_EQ(fake.systemLog.lines(),
              (std::vector<std::string>{"told by a function", "2 aliases", "unobserved"}));
}

TEST_F(PCLogManagerTest, ConcurrentCallsAreOneWholeRecordEach) {
    constexpr int threadCount = 8;
    constexpr int callCount = 200;
    std::vector<std::thread> threads;
    for (int i = 0; i < threadCount; ++i) {
        threads.emplace_back([i] {
            for (int call = 0; call < callCount; ++call) {
                WL_LOG("thread %d", i);
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    std::map<std::string, int> counts;
    for (const std::string& line : fake.systemLog.lines()) {
        ++counts[line];
    }
    ASSERT_EQ(counts.size(), static_cast<std::size_t>(threadCount));
    for (const auto& [line, number] : counts) {
        EXPECT_EQ(number, callCount) << line;
    }
}

} // namespace
} // namespace welcomer
