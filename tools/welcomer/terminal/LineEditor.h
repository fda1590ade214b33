// Mending a line while it is typed: the cursor keys, deleting anywhere, redrawing after Ctrl-Z.

#pragma once

#include <optional>
#include <string>

namespace welcomer::tool {

// libedit, loaded when a question is asked: every start of the tool would take half as long again with it.
class LineEditor {
  public:
    // Looks for the library.
    //  terminal  where to ask; borrowed
    explicit LineEditor(int terminal);

    // Whether the library is installed.
    bool isThere() const;

    // Shows the prompt and reads a line.
    //  result  the line without its end; none when the input has ended
    // A signal that ends or stops the program takes its course after the terminal is as it was.
    std::optional<std::string> readLine(const std::string& prompt) const;

  private:
    const int _terminal;
};

} // namespace welcomer::tool
