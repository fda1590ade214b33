// What happened at one login, made from the agent's own log lines.

#pragma once

#include "tools/welcomer/login/DelegateReport.h"
#include "tools/welcomer/login/ServiceReport.h"

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer::tool {

// Times are since the agent's start.
class LoginRecord {
  public:
    // How far the agent came. Unfinished: its last line has not come, or never came. Broken: somebody else's
    // code ended it.
    enum class End { Unfinished, Ended, Broken };

    // Takes the agent's next log line.
    //  result  whether it says anything that the record keeps
    bool read(std::chrono::nanoseconds time, std::string_view line);

    const std::vector<DelegateOutcome>& delegates() const { return _delegates.delegates(); }
    const std::vector<ServiceOutcome>& services() const { return _services.services(); }
    std::size_t working() const { return _delegates.working(); }

    // Whose cloud account it was; empty where there was no item to read it from.
    const std::string& account() const { return _account; }

    // The credential store's status where the item could not be asked for or found.
    std::optional<std::int32_t> itemStatus() const { return _itemStatus; }

    // Lines that tell of a failure, besides those of delegates and services.
    const std::vector<std::string>& failures() const { return _failures; }

    // Since when the agent has waited for the delegates, and lingered.
    std::optional<std::chrono::nanoseconds> waiting() const { return _waiting; }
    std::optional<std::chrono::nanoseconds> lingering() const { return _lingering; }

    End end() const { return _end; }

    // What ended it, of a broken one: the line.
    const std::string& endReason() const { return _endReason; }

    // The time of the last line so far.
    std::chrono::nanoseconds last() const { return _last; }

  private:
    bool _readEnd(std::string_view line);
    bool _readFailure(std::string_view line);

    DelegateReport _delegates;
    ServiceReport _services;
    std::string _account;
    std::optional<std::int32_t> _itemStatus;
    std::vector<std::string> _failures;
    std::optional<std::chrono::nanoseconds> _waiting;
    std::optional<std::chrono::nanoseconds> _lingering;
    std::chrono::nanoseconds _last{0};
    End _end = End::Unfinished;
    std::string _endReason;
};

} // namespace welcomer::tool
