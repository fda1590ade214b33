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
    return _state->result.get();
}

bool PromptWait::wasGivenUp() const {
    return _state->isGivenUp;
}

} // namespace welcomer::desktop
