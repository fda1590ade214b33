// What became of each delegate, read from the agent's own log lines: they are all that the agent says.

#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer::tool {

// One delegate of a login. Times are since the agent's start.
struct DelegateOutcome {
    // Refused: it answered with an error. Working: no outcome is known yet, or none ever came.
    enum class Kind { Working, NoResponse, Completed, Refused, Raised };

    std::string identifier;
    Kind kind = Kind::Working;
    std::string reason = {};   // of a refusal or an exception
    std::string progress = {}; // what it last said of it: "40 % copying"; empty where it has said nothing
    std::string seconds = {};  // as the agent printed them; empty where it prints none
    std::chrono::nanoseconds begin{0};
    std::chrono::nanoseconds end{0}; // of the outcome's line

    bool working() const { return kind == Kind::Working; }

    // "completed", "no cached response", or what went wrong; until that is known "working", and how far it has come.
    std::string text() const;
};

class DelegateReport {
  public:
    // Takes the next log line; lines that speak of no delegate change nothing.
    //  time    since the agent's start
    //  result  whether it speaks of one
    bool read(std::chrono::nanoseconds time, std::string_view line);

    // In the order in which the log first named them.
    const std::vector<DelegateOutcome>& delegates() const { return _delegates; }

    std::size_t working() const;

  private:
    std::vector<DelegateOutcome> _delegates;
};

} // namespace welcomer::tool
