#include "backends/desktop/credentials/PromptWait.h"

#include <algorithm>

namespace welcomer::desktop {

namespace {

guint milliseconds(std::chrono::nanoseconds duration) {
    const auto count = std::chrono::ceil<std::chrono::milliseconds>(duration).count();
    return static_cast<guint>(std::clamp<std::int64_t>(count, 0, G_MAXINT));
}

} // namespace

struct PromptWait::State {
    GMainContext* context = g_main_context_new();
    ObjectPointer<GAsyncResult> result;
    ObjectPointer<GCancellable> cancellable; // made where it is wanted
    std::chrono::nanoseconds patience{};
    bool isGivenUp = false;
    int references = 1; // one of the wait, one of the call

    void attach(std::chrono::nanoseconds delay, GSourceFunc function) {
        GSource* const source = g_timeout_source_new(milliseconds(delay));
        g_source_set_callback(source, function, this, nullptr);
        g_source_attach(source, context);
        g_source_unref(source);
    }

    static gboolean giveUp(gpointer data) {
        static_cast<State*>(data)->isGivenUp = true;
        return G_SOURCE_REMOVE;
    }

    void release() {
        if (--references == 0) {
            g_main_context_unref(context);
            delete this;
        }
    }
};

PromptWait::PromptWait(std::chrono::nanoseconds patience) : _state(std::make_unique<State>().release()) {
    _state->patience = patience;
    g_main_context_push_thread_default(_state->context);
}

PromptWait::~PromptWait() {
    // It may hold the last reference to an object.
    _state->result.reset();
    // What is left to be told, such as to the objects that the call made.
    while (g_main_context_iteration(_state->context, FALSE)) {
    }
    g_main_context_pop_thread_default(_state->context);
    _state->release();
}

gpointer PromptWait::argument() const {
    ++_state->references;
    return _state;
}

GCancellable* PromptWait::cancellable() {
    _state->cancellable.reset(g_cancellable_new());
    return _state->cancellable.get();
}

void PromptWait::done(GObject* /*source*/, GAsyncResult* result, gpointer wait) {
    auto* const state = static_cast<State*>(wait);
    state->result.reset(static_cast<GAsyncResult*>(g_object_ref(result)));
    state->release();
}

GAsyncResult* PromptWait::wait() {
    _state->attach(_state->patience, State::giveUp);
    while (!_state->result && !_state->isGivenUp) {
        g_main_context_iteration(_state->context, TRUE);
    }
    if (!_state->result && _state->cancellable) {
        g_cancellable_cancel(_state->cancellable.get());
        while (!_state->result) {
            g_main_context_iteration(_state->context, TRUE);
        }
        _state->result.reset();
    }
    return _state->result.get();
}

bool PromptWait::wasGivenUp() const {
    return _state->isGivenUp;
}

} // namespace welcomer::desktop
