// A line of the log that programs can read, too: `name=value` after a first word, values in quotes where they
// need them.

#pragma once

#include <string>
#include <string_view>

namespace welcomer::server {

class LogLine {
  public:
    explicit LogLine(std::string_view event) : _text(event) {}

    // Adds a value; a long one is cut.
    LogLine& add(std::string_view name, std::string_view value);

    // The line, without anything that could end it or steer a terminal.
    const std::string& text() const { return _text; }

  private:
    std::string _text;
};

} // namespace welcomer::server
