// The terminal as it was, however the program ends.

#pragma once

#include <termios.h>

namespace welcomer::tool {

// While it lives, a signal that ends the program, a fault of its own among them, does so only after the terminal has got
// the settings back that it had at first. Signals whose action somebody has changed keep that. One at a time; any
// thread may get the signal.
class TerminalRestorer {
  public:
    //  terminal  a terminal's descriptor, open for as long as this lives
    explicit TerminalRestorer(int terminal);
    ~TerminalRestorer();
    TerminalRestorer(const TerminalRestorer&) = delete;
    TerminalRestorer& operator=(const TerminalRestorer&) = delete;

    // The settings that the terminal had at first.
    const termios& before() const { return _before; }

  private:
    termios _before{};
};

} // namespace welcomer::tool
