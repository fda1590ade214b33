// Ctrl-C and the like, while something is to be put right before the program ends.

#pragma once

namespace welcomer::tool {

// Holds back the signals that end a program from outside (Ctrl-C, a closed terminal, SIGTERM), so that what
// was made can be taken away first. When this ends, a signal that came meanwhile takes its course.
class InterruptionGuard {
  public:
    InterruptionGuard();
    ~InterruptionGuard();
    InterruptionGuard(const InterruptionGuard&) = delete;
    InterruptionGuard& operator=(const InterruptionGuard&) = delete;

    // A descriptor that is readable once such a signal has come.
    int descriptor() const { return _descriptor; }

    // To be called in a child process: signals take their course there at once.
    void release();

  private:
    int _descriptor = -1;
};

// Thrown by who watches a guard's descriptor, when a signal has come. The guard's owner passes the signal on.
class Interrupted {};

} // namespace welcomer::tool
