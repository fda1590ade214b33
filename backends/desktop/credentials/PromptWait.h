// Waiting for a call that may ask the user something.

#pragma once

#include "backends/desktop/GLibPointer.h"

#include <chrono>

namespace welcomer::desktop {

// Runs one asynchronous call on a main context of its own, and gives it up when nobody answers. One call, one
// thread.
//
// A prompt that is given up is left as it is, and goes with this process at the latest: gnome-keyring (42)
// ends with a failed assertion when somebody dismisses a prompt to unlock, and with it all that other
// programs have unlocked. A call that asks nobody anything takes cancellable(), and is then ended when it is
// given up.
class PromptWait {
  public:
    explicit PromptWait(std::chrono::nanoseconds patience);
    ~PromptWait();
    PromptWait(const PromptWait&) = delete;
    PromptWait& operator=(const PromptWait&) = delete;

    // What the asynchronous call takes.
    static void done(GObject* source, GAsyncResult* result, gpointer wait);
    gpointer argument() const;
    GCancellable* cancellable();

    // Waits for the call.
    //  result  its result, borrowed; null when it had to be given up without one
    GAsyncResult* wait();

    // Whether nobody has answered in time.
    bool wasGivenUp() const;

  private:
    struct State;
    State* const _state; // shared with the call
};

} // namespace welcomer::desktop
