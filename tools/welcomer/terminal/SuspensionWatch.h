// Ctrl-Z at a question, and the return from it.

#pragma once

#include <csignal>

namespace welcomer::tool {

// While it lives, Ctrl-Z waits until the terminal is as the shell wants it, and whoever waits for a line
// learns that the program was stopped and goes on, so that the question can be shown again. One at a time.
class SuspensionWatch {
  public:
    SuspensionWatch();
    ~SuspensionWatch();
    SuspensionWatch(const SuspensionWatch&) = delete;
    SuspensionWatch& operator=(const SuspensionWatch&) = delete;

    // A descriptor that is readable once the program is to be stopped, or was.
    int descriptor() const { return _event; }

    // Stops the program where that was asked for, until it is told to go on.
    void takeEffect();

  private:
    void _forgetWhatCame() const;

    const int _event;
    struct sigaction _stopBefore {};
    struct sigaction _continueBefore {};
};

} // namespace welcomer::tool
