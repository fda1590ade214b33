#include "backends/desktop/glib/AsyncCall.h"

namespace welcomer::desktop {

struct AsyncCall::State {
    MainContext context;
    ObjectPointer<GAsyncResult> result;
    ObjectPointer<GCancellable> cancellable; // made where it is wanted
    std::chrono::nanoseconds patience{};
    bool isGivenUp = false;
    int references = 1; // one of this object, one of the call

    void release() {
        if (--references == 0) {
            delete this;
        }
    }
};

void AsyncCall::Release::operator()(State* state) const {
    state->release();
}

AsyncCall::AsyncCall(std::chrono::nanoseconds patience)
    : _state(std::make_unique<State>().release()),
      _scope(_state->context) {
    _state->patience = patience;
}

AsyncCall::~AsyncCall() {
    // It may hold the last reference to an object.
    _state->result.reset();
    // What is left to be told, such as to the objects that the call made.
    _state->context.deliver();
}

gpointer AsyncCall::argument() const {
    ++_state->references;
    return _state.get();
}

GCancellable* AsyncCall::cancellable() {
    _state->cancellable.reset(g_cancellable_new());
    return _state->cancellable.get();
}

void AsyncCall::done(GObject* /*source*/, GAsyncResult* result, gpointer call) {
    auto* const state = static_cast<State*>(call);
    state->result.reset(static_cast<GAsyncResult*>(g_object_ref(result)));
    state->release();
}

GAsyncResult* AsyncCall::wait() {
    State& state = *_state;
    const auto isDone = [&state] {
        return state.result != nullptr;
    };
    state.isGivenUp = !state.context.waitUntil(isDone, Deadline(state.patience));
    if (state.isGivenUp && state.cancellable) {
        g_cancellable_cancel(state.cancellable.get());
        state.context.waitUntil(isDone);
        state.result.reset();
    }
    return state.result.get();
}

bool AsyncCall::wasGivenUp() const {
    return _state->isGivenUp;
}

} // namespace welcomer::desktop
