// What became of each service that the agent turns on, read from its log lines.

#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer::tool {

// One service of a login. Times are since the agent's start.
struct ServiceOutcome {
    // OfSetup: turned on before the login, by setup. PutOff: to be turned on some seconds later.
    enum class Kind { Enabled, PutOff, Refused, OfSetup };

    std::string identifier;
    Kind kind = Kind::Enabled;
    std::string reason = {};             // of a refusal: the line
    std::chrono::nanoseconds named{0};   // when the log first named it
    std::chrono::nanoseconds settled{0}; // when it was turned on, or refused

    // "enabled", "put off, and never enabled", "enabled by setup", or the reason.
    std::string text() const;
};

class ServiceReport {
  public:
    // Takes the next log line; lines that speak of no service change nothing.
    //  time    since the agent's start
    //  result  whether it speaks of one
    bool read(std::chrono::nanoseconds time, std::string_view line);

    // In the order in which the log first named them.
    const std::vector<ServiceOutcome>& services() const { return _services; }

  private:
    void _settle(std::chrono::nanoseconds time, std::string_view identifier, ServiceOutcome::Kind kind,
                 std::string_view reason = "");

    std::vector<ServiceOutcome> _services;
};

} // namespace welcomer::tool
