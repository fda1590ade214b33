// Sleeping until a log has more lines of logins.

#pragma once

#include "tools/welcomer/login/LoginLog.h"

#include <memory>
#include <string>

namespace welcomer::tool {

// One thread.
class LogWatch {
  public:
    LogWatch() = default;
    LogWatch(const LogWatch&) = delete;
    LogWatch& operator=(const LogWatch&) = delete;
    virtual ~LogWatch() = default;

    // Sleeps until there may be more lines of logins than there were at the last call, or when the watch was made.
    // Of others' lines in the same log alone the process wakes up meanwhile, to look at them. Throws CommandFailure
    // where the log cannot be watched any more.
    virtual void wait() = 0;
};

// Watches the log that logins were found in; what comes from now on is noticed. Throws CommandFailure with the
// reason where it cannot be watched.
//  source  as FoundLogins has it
std::unique_ptr<LogWatch> watchLog(const LoginQuery& query, const std::string& source);

// The journal, and none where this build knows none.
std::unique_ptr<LogWatch> watchJournal(const LoginQuery& query);

// The syslog files.
std::unique_ptr<LogWatch> watchSyslogFiles(const std::string& root);

} // namespace welcomer::tool
