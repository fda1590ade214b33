#include "backends/desktop/runloop/GLibRunLoop.h"

#include <glib.h>
#include <utility>

namespace welcomer::desktop {

namespace {

// The loop always counts as having a source: there is nothing to hold.
class Port final : public platform::RunLoopPort {};

// The moment, in GLib's microseconds, from which on a duration has passed whole.
gint64 momentAfter(std::chrono::nanoseconds duration) {
    const gint64 now = g_get_monotonic_time();
    if (duration <= std::chrono::nanoseconds::zero()) {
        return now;
    }
    // Now is rounded down, and so is the duration.
    return now + std::chrono::duration_cast<std::chrono::microseconds>(duration).count() + 2;
}

void sleepUntil(gint64 moment) {
    for (gint64 now = g_get_monotonic_time(); now < moment; now = g_get_monotonic_time()) {
        g_usleep(static_cast<gulong>(moment - now));
    }
}

// Wakes the context at a moment, for as long as it lives.
class Alarm {
  public:
    explicit Alarm(gint64 moment) : _source(g_source_new(&kFunctions, sizeof(GSource))) {
        g_source_set_ready_time(_source, moment);
        g_source_set_priority(_source, G_PRIORITY_HIGH);
        g_source_set_can_recurse(_source, TRUE);
        g_source_attach(_source, nullptr);
    }
    ~Alarm() {
        g_source_destroy(_source);
        g_source_unref(_source);
    }
    Alarm(const Alarm&) = delete;
    Alarm& operator=(const Alarm&) = delete;

  private:
    static gboolean dispatch(GSource* source, GSourceFunc /*callback*/, gpointer /*data*/) {
        g_source_set_ready_time(source, -1);
        return G_SOURCE_CONTINUE;
    }

    static GSourceFuncs kFunctions;

    GSource* const _source;
};

GSourceFuncs Alarm::kFunctions = {nullptr, nullptr, dispatch, nullptr, nullptr, nullptr};

} // namespace

void GLibRunLoop::run(std::chrono::nanoseconds duration) {
    const gint64 deadline = momentAfter(duration);
    if (g_main_context_is_owner(nullptr) == FALSE) {
        sleepUntil(deadline); // GLib would wait for the owner, who never lets go
        return;
    }
    std::unique_lock lock(_mutex);
    // A block that performs itself again does not keep a run for nothing from ending.
    const std::uint64_t pendingAtStart = _performed;
    while (_begun < pendingAtStart) {
        lock.unlock();
        g_main_context_iteration(nullptr, FALSE);
        lock.lock();
    }
    lock.unlock();
    if (duration <= std::chrono::nanoseconds::zero()) {
        g_main_context_iteration(nullptr, FALSE); // what else is ready
        return;
    }
    const Alarm alarm(deadline);
    while (g_get_monotonic_time() < deadline) {
        g_main_context_iteration(nullptr, TRUE);
    }
}

void GLibRunLoop::perform(std::function<void()> block) {
    {
        const std::lock_guard lock(_mutex);
        _pending.push_back(std::move(block));
        ++_performed;
    }
    // As urgent as what others attach without saying how urgent it is: blocks must not starve.
    GSource* const source = g_idle_source_new();
    g_source_set_priority(source, G_PRIORITY_DEFAULT);
    g_source_set_callback(
        source,
        [](gpointer loop) -> gboolean {
            static_cast<GLibRunLoop*>(loop)->runNext();
            return G_SOURCE_REMOVE;
        },
        this, nullptr);
    g_source_attach(source, nullptr);
    g_source_unref(source);
}

void GLibRunLoop::runNext() noexcept {
    std::unique_lock lock(_mutex);
    if (_pending.empty()) {
        return;
    }
    const std::function<void()> block = std::move(_pending.front());
    _pending.pop_front();
    ++_begun;
    lock.unlock();
    block();
}

std::unique_ptr<platform::RunLoopPort> GLibRunLoop::attachPort() {
    return std::make_unique<Port>();
}

std::unique_ptr<GLibRunLoops> GLibRunLoops::create() {
    // Never released. An owner may acquire it again.
    if (g_main_context_acquire(nullptr) == FALSE) {
        return nullptr;
    }
    return std::unique_ptr<GLibRunLoops>(new GLibRunLoops);
}

std::shared_ptr<platform::RunLoop> GLibRunLoops::current() {
    static const auto loop = std::make_shared<GLibRunLoop>();
    return loop;
}

} // namespace welcomer::desktop
