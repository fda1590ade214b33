// An asynchronous call that is waited for, and given up in time.

#pragma once

#include "backends/desktop/glib/MainContext.h"
#include "backends/desktop/glib/Pointers.h"

#include <chrono>
#include <memory>

namespace welcomer::desktop {

// Runs one asynchronous call on a main context of its own, and gives it up when nobody answers. One call, one
// thread.
//
// A call that takes cancellable() is ended when it is given up. One that does not is left as it is, and goes
// with this process at the latest: a prompt of the keyring, for one, must not be dismissed, because
// gnome-keyring (42) then ends with a failed assertion when it was to unlock, and with it all that other
// programs have unlocked.
class AsyncCall {
  public:
    explicit AsyncCall(std::chrono::nanoseconds patience);
    ~AsyncCall();
    AsyncCall(const AsyncCall&) = delete;
    AsyncCall& operator=(const AsyncCall&) = delete;

    // What the asynchronous call takes.
    static void done(GObject* source, GAsyncResult* result, gpointer call);
    gpointer argument() const;
    GCancellable* cancellable();

    // Waits for the call.
    //  result  its result, borrowed; null when it had to be given up without one
    GAsyncResult* wait();

    // Whether nobody has answered in time.
    bool wasGivenUp() const;

  private:
    struct State;
    struct Release {
        void operator()(State* state) const;
    };
    const std::unique_ptr<State, Release> _state; // shared with the call
    const MainContext::Scope _scope;
};

} // namespace welcomer::desktop
