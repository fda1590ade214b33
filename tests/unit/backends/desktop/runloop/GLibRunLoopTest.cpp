// The main thread's loop while other threads run GLib's default main context, or try to.

#include "backends/desktop/runloop/DesktopRunLoops.h"

#include <glib.h>
#include <gtest/gtest.h>

#include <ctime>
#include <memory>
#include <thread>
#include <typeinfo>

namespace welcomer::desktop {

namespace {

using namespace std::chrono_literals;
using std::chrono::steady_clock;

// A thread that runs GLib's default main context until it is told to end.
class LoopThread {
  public:
    LoopThread() : _thread([this] { g_main_loop_run(_loop.get()); }) {
        while (g_main_loop_is_running(_loop.get()) == FALSE) {
            std::this_thread::sleep_for(1ms);
        }
    }
    ~LoopThread() {
        g_main_loop_quit(_loop.get());
        _thread.join();
    }
    LoopThread(const LoopThread&) = delete;
    LoopThread& operator=(const LoopThread&) = delete;

  private:
    const std::unique_ptr<GMainLoop, void (*)(GMainLoop*)> _loop{g_main_loop_new(nullptr, FALSE),
                                                                 g_main_loop_unref};
    std::thread _thread;
};

// The processor's time that the calling thread has used.
std::chrono::nanoseconds timeUsed() {
    timespec time{};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &time);
    return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
}

// Runs a loop for half a second, which must take that long and hardly any of the processor's time.
void expectKeepsTime(platform::RunLoop& loop) {
    const auto begin = steady_clock::now();
    const auto used = timeUsed();
    loop.run(500ms);
    EXPECT_GE(steady_clock::now() - begin, 500ms);
    EXPECT_LT(timeUsed() - used, 250ms);
}

bool canAcquireElsewhere() {
    bool acquired = false;
    std::thread([&] {
        acquired = g_main_context_acquire(nullptr) != FALSE;
        if (acquired) {
            g_main_context_release(nullptr);
        }
    }).join();
    return acquired;
}

} // namespace

TEST(GLibRunLoopTest, NoOtherThreadCanTakeTheContext) {
    EXPECT_TRUE(canAcquireElsewhere()) << "as it is before";
    {
        DesktopRunLoops runLoops;
        const auto loop = runLoops.current();
        EXPECT_FALSE(canAcquireElsewhere());
        loop->run(0ns);
        loop->run(1ms);
        EXPECT_FALSE(canAcquireElsewhere());
    }
    EXPECT_FALSE(canAcquireElsewhere()) << "the process's life is longer than the platform's";
}

TEST(GLibRunLoopTest, ARunKeepsItsTimeWhileAnotherThreadWaitsForTheContext) {
    DesktopRunLoops runLoops;
    const auto loop = runLoops.current();
    const LoopThread waiting;
    expectKeepsTime(*loop);
    loop->run(0ns);
}

TEST(GLibRunLoopTest, BlocksAndSourcesRunOnTheMainThreadWhileAnotherOneRunsTheContext) {
    DesktopRunLoops runLoops;
    const auto loop = runLoops.current();
    const LoopThread waiting;
    std::thread::id blocksThread, sourcesThread;
    std::thread([&] {
        loop->perform([&] { blocksThread = std::this_thread::get_id(); });
        g_idle_add(
            [](gpointer data) -> gboolean {
                *static_cast<std::thread::id*>(data) = std::this_thread::get_id();
                return G_SOURCE_REMOVE;
            },
            &sourcesThread);
    }).join();
    std::this_thread::sleep_for(50ms); // the other thread's turn, if it had one
    EXPECT_EQ(blocksThread, std::thread::id());
    loop->run(50ms);
    EXPECT_EQ(blocksThread, std::this_thread::get_id());
    EXPECT_EQ(sourcesThread, std::this_thread::get_id());
}

TEST(GLibRunLoopTest, ARunOnAnotherThreadLetsTheTimePassAndRunsNothing) {
    DesktopRunLoops runLoops;
    const auto loop = runLoops.current();
    bool hasRun = false;
    loop->perform([&] { hasRun = true; });
    std::thread([&] {
        expectKeepsTime(*loop);
        loop->run(0ns);
        loop->run(-1h);
    }).join();
    EXPECT_FALSE(hasRun);
    loop->run(0ns);
    EXPECT_TRUE(hasRun);
}

TEST(GLibRunLoopTest, WhereAnotherThreadHasTheContextFirstTheMainThreadHasALocalLoop) {
    const LoopThread owner;
    DesktopRunLoops runLoops;
    const auto loop = runLoops.current();
    const auto local = local::LocalRunLoops().current();
    const platform::RunLoop& given = *loop;
    const platform::RunLoop& localOne = *local;
    EXPECT_TRUE(typeid(given) == typeid(localOne));
    const auto port = loop->attachPort();
    std::thread::id ranOn;
    std::thread([&] { loop->perform([&] { ranOn = std::this_thread::get_id(); }); }).join();
    expectKeepsTime(*loop);
    EXPECT_EQ(ranOn, std::this_thread::get_id());
}

} // namespace welcomer::desktop
