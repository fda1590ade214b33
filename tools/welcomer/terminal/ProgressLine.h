// One line on stderr that is written over again and again. Where stderr is no terminal nothing is shown.

#pragma once

#include <string>

namespace welcomer::tool {

class ProgressLine {
  public:
    ProgressLine();
    ~ProgressLine(); // clears it
    ProgressLine(const ProgressLine&) = delete;
    ProgressLine& operator=(const ProgressLine&) = delete;

    // Whether it can be seen at all.
    bool visible() const { return _visible; }

    // Shows a text in place of the one before; without control characters, and cut to the terminal's width.
    void show(const std::string& text);

    // Takes the text away. To be called before anything else is written to the terminal.
    void clear();

    // A bar such as "[######------]".
    //  done  the part that is done, 0 to 1
    static std::string bar(double done);

  private:
    bool _visible;
    bool _shown = false;
};

} // namespace welcomer::tool
