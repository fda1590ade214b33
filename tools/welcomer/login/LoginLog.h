// Where the log lines of logins are found: the journal, or the syslog file where there is no journal.

#pragma once

#include "tools/welcomer/login/LoginLines.h"

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer::tool {

inline constexpr const char* kJournalName = "journal";

// Where syslog daemons write, by custom.
inline constexpr std::array kSyslogFiles{"/var/log/syslog", "/var/log/messages", "/var/log/user.log"};

// What is wanted.
struct LoginQuery {
    std::string root = "/";    // the logs are looked up below it
    std::uint32_t userID = 0;  // whose logins; a syslog file does not tell users apart
    std::string userName = {}; // for what people are told
    std::size_t last = 1;      // how many at most, the last ones
    std::optional<std::chrono::microseconds> since = {}; // since 1970: none that ended before
};

// What there is. Either may hold lines that were cut off at the log's own beginning.
struct FoundLogins {
    std::vector<Login> logins; // in the order of time
    std::string source;        // "journal", or the file's path; empty where nothing can be read
    std::string note; // what is to be known of the source, or why nothing was found; one line or empty
};

// Any thread. Reads a bounded part of the log, from its end.
FoundLogins findLogins(const LoginQuery& query);

// What one source has.
struct SourceLines {
    bool isThere = false;    // there is such a log
    bool isReadable = false; // this process may read it
    std::string name = {};
    std::vector<LogLine> lines = {};
};

// The journal, without which this build knows none.
SourceLines readJournal(const LoginQuery& query);

// The syslog file.
//  now  since 1970: lines in the traditional format have no year
SourceLines readSyslogFile(const LoginQuery& query, std::chrono::microseconds now);

// A line of a syslog file, in rsyslog's traditional format or in the one with ISO times; none for what is
// neither. Its process is known where the line has one.
std::optional<LogLine> readSyslogLine(std::string_view line, std::chrono::microseconds now);

// Whether enough of a log was read backwards: the last logins that are wanted have all begun, or what comes is
// too old.
class EnoughLines {
  public:
    explicit EnoughLines(const LoginQuery& query) : _query(query) {}

    //  line    the next one towards the log's beginning
    //  result  whether it still belongs to what is wanted
    bool wants(const LogLine& line);

  private:
    const LoginQuery& _query;
    std::size_t _lines = 0;
    std::size_t _logins = 0;
};

} // namespace welcomer::tool
