// Keeps the calls that fakes receive, in their order, so that a test can assert the order across interfaces.

#pragma once

#include <mutex>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer::fakes {

// Each call is one line: "Interface.operation argument, argument". Any thread.
class CallRecorder {
  public:
    void record(std::string call);

    // Every call so far.
    std::vector<std::string> calls() const;

    // The calls whose line begins with this text, for example "FileSystem." or "CredentialStore.deleteItem".
    std::vector<std::string> callsTo(std::string_view prefix) const;

    // Forgets the calls so far.
    void clear();

  private:
    mutable std::mutex _mutex;
    std::vector<std::string> _calls;
};

} // namespace welcomer::fakes
