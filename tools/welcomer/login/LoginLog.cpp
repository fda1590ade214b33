#include "tools/welcomer/login/LoginLog.h"

#include "handoff/LaunchAgentFile.h"
#include "tools/welcomer/login/AgentTexts.h"

#include <algorithm>
#include <utility>

namespace welcomer::tool {

namespace {

constexpr std::size_t kMostLines = 100'000;

std::string whyNothing(const LoginQuery& query, const SourceLines& journal, const SourceLines& file) {
    const std::string askWithRights = ": \"sudo welcomer log --user " + query.userName + "\" shows them";
    if (journal.isThere && !journal.isReadable) {
        return "the journal keeps its lines where administrators alone read them" + askWithRights;
    }
    if (!journal.isThere && file.isThere && !file.isReadable) {
        return "administrators alone read " + file.name + askWithRights;
    }
    if (!journal.isThere && !file.isThere) {
        return "there is neither a journal nor a syslog file to read";
    }
    return "";
}

} // namespace

bool EnoughLines::wants(const LogLine& line) {
    if (++_lines > kMostLines) {
        return false;
    }
    const bool isAgents = line.program == kAgentProgramName && !line.isOutput;
    if (_logins >= _query.last) {
        return !isAgents; // what the launcher said before the agent's beginning
    }
    if (isAgents && line.message == agenttext::kBegin) {
        _logins = _query.since && line.wallClock < *_query.since ? _query.last : _logins + 1;
    }
    return true;
}

FoundLogins findLogins(const LoginQuery& query) {
    SourceLines journal = readJournal(query);
    SourceLines file;
    FoundLogins found;
    if (journal.lines.empty()) {
        file = readSyslogFile(query, std::chrono::duration_cast<std::chrono::microseconds>(
                                         std::chrono::system_clock::now().time_since_epoch()));
    }
    if (!file.lines.empty()) {
        found.note = file.name + " does not say which user a line is of";
    } else if (journal.lines.empty()) {
        found.note = whyNothing(query, journal, file);
    }
    SourceLines& source = file.lines.empty() && journal.isReadable ? journal : file;
    found.source = source.isReadable ? source.name : "";
    found.logins = toldApart(std::move(source.lines));
    if (query.since) {
        std::erase_if(found.logins,
                      [&](const Login& login) { return login.lines.back().wallClock < *query.since; });
    }
    if (found.logins.size() > query.last) {
        found.logins.erase(found.logins.begin(),
                           found.logins.end() - static_cast<std::ptrdiff_t>(query.last));
    }
    return found;
}

} // namespace welcomer::tool
