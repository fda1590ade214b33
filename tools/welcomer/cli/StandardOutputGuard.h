// Keeps plug-ins' own words out of the tool's results.

#pragma once

namespace welcomer::tool {

// While it lives, what is written to the standard output goes to stderr. Around every call into plug-ins.
class StandardOutputGuard {
  public:
    StandardOutputGuard();
    ~StandardOutputGuard();
    StandardOutputGuard(const StandardOutputGuard&) = delete;
    StandardOutputGuard& operator=(const StandardOutputGuard&) = delete;

  private:
    const int _real;
};

} // namespace welcomer::tool
