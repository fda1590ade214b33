// What became of each delegate, read from the agent's own log lines: they are all that the agent says.

#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer::tool {

// One delegate of a login.
struct DelegateOutcome {
    std::string identifier;
    std::string outcome; // "completed", "no cached response", or what went wrong; "working" until it is known
    std::string seconds; // as the agent printed them; empty where it prints none

    bool working() const { return outcome == kWorking; }
    static constexpr const char* kWorking = "working";
};

class DelegateReport {
  public:
    // Takes the next log line; lines that speak of no delegate change nothing.
    void read(std::string_view line);

    // In the order in which the log first named them.
    const std::vector<DelegateOutcome>& delegates() const { return _delegates; }

    std::size_t working() const;

  private:
    bool _readOutcome(DelegateOutcome& delegate, std::string_view line);

    std::vector<DelegateOutcome> _delegates;
};

} // namespace welcomer::tool
