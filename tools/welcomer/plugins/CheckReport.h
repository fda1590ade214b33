// What a check has to say, from the process that it runs in.

#pragma once

#include <functional>
#include <string>

namespace welcomer::tool {

// Any thread.
class CheckReport {
  public:
    using Tell = std::function<void(const std::string& text)>;

    explicit CheckReport(Tell tell) : _tell(std::move(tell)) {}

    // What is about to be done: named when the process ends in it.
    void step(const std::string& text) { _send("step", text); }

    // Something that is wrong.
    void find(const std::string& text) { _send("found", text); }

    // What was seen where nothing is wrong.
    void see(const std::string& text) { _send("seen", text); }

    // The check is through.
    void finish() { _send("finished", ""); }

  private:
    void _send(const char* kind, const std::string& text);

    const Tell _tell;
};

} // namespace welcomer::tool
