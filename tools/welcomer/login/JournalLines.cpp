#include "handoff/LaunchAgentFile.h"
#include "tools/shared/AgentUnit.h"
#include "tools/shared/Journal.h"
#include "tools/welcomer/login/LogWatch.h"
#include "tools/welcomer/terminal/Failure.h"

#include <algorithm>
#include <filesystem>
#include <limits>
#include <memory>
#include <system_error>
#include <utility>

namespace welcomer::tool {

namespace {

using journal::Journal;
using journal::match;

Journal openJournal(const std::string& root) {
    sd_journal* journal = nullptr;
    const int opened = root == "/" ? ::sd_journal_open(&journal, SD_JOURNAL_LOCAL_ONLY)
                                   : ::sd_journal_open_directory(&journal, root.c_str(), SD_JOURNAL_OS_ROOT);
    return Journal(opened >= 0 ? journal : nullptr);
}

// What can be told of a folder of journal files.
enum class FolderState { WithoutFiles, Hidden, WithFiles };

// Who may not read the files sees their names, unless the folder itself is hidden.
FolderState stateOf(const std::filesystem::path& folder) {
    std::error_code error;
    std::filesystem::recursive_directory_iterator entries(folder, error);
    for (const std::filesystem::recursive_directory_iterator end; entries != end; entries.increment(error)) {
        if (entries->path().extension() == ".journal") {
            return FolderState::WithFiles;
        }
    }
    return error == std::errc::permission_denied ? FolderState::Hidden : FolderState::WithoutFiles;
}

// The lines of one user's agent and of its launcher, and all that comes from the agent's unit.
void matchLogins(sd_journal* journal, std::uint32_t userID) {
    match(journal, "_UID", std::to_string(userID));
    match(journal, "SYSLOG_IDENTIFIER", kAgentProgramName);
    match(journal, "SYSLOG_IDENTIFIER", kLauncherProgram);
    ::sd_journal_add_disjunction(journal);
    match(journal, "_UID", std::to_string(userID));
    match(journal, "_SYSTEMD_USER_UNIT", launch::unitName(kLaunchAgentLabel));
}

// A field of the current entry; empty where it has none.
std::string field(sd_journal* journal, const std::string& name) {
    return journal::field(journal, name).value_or("");
}

LogLine currentLine(sd_journal* journal) {
    LogLine line;
    std::uint64_t time = 0;
    sd_id128_t boot{};
    ::sd_journal_get_realtime_usec(journal, &time);
    line.wallClock = std::chrono::microseconds(time);
    ::sd_journal_get_monotonic_usec(journal, &time, &boot);
    line.steady = std::chrono::microseconds(time);
    line.program = field(journal, "SYSLOG_IDENTIFIER");
    line.message = field(journal, "MESSAGE");
    line.process = field(journal, "_BOOT_ID") + "/" + field(journal, "_PID");
    line.invocation = field(journal, "_SYSTEMD_INVOCATION_ID");
    line.isOutput = field(journal, "_TRANSPORT") == "stdout";
    return line;
}

class JournalWatch : public LogWatch {
  public:
    explicit JournalWatch(const LoginQuery& query) : _journal(openJournal(query.root)) {
        if (!_journal) {
            throw CommandFailure("the journal cannot be followed");
        }
        matchLogins(_journal.get(), query.userID);
        // What comes stands behind the last entry, or behind the beginning.
        ::sd_journal_seek_tail(_journal.get());
        if (::sd_journal_previous(_journal.get()) <= 0) {
            ::sd_journal_seek_head(_journal.get());
        }
    }

    void wait() override {
        while (!_hasMore()) {
            const int woken = ::sd_journal_wait(_journal.get(), std::numeric_limits<std::uint64_t>::max());
            if (woken < 0) {
                throw CommandFailure("the journal cannot be followed: " +
                                     std::generic_category().message(-woken));
            }
        }
    }

  private:
    bool _hasMore() {
        bool more = false;
        while (::sd_journal_next(_journal.get()) > 0) {
            more = true;
        }
        return more;
    }

    Journal _journal;
};

} // namespace

std::unique_ptr<LogWatch> watchJournal(const LoginQuery& query) {
    return std::make_unique<JournalWatch>(query);
}

SourceLines readJournal(const LoginQuery& query) {
    const std::filesystem::path root = query.root;
    const FolderState onDisk = stateOf(root / "var/log/journal");
    const FolderState inMemory = stateOf(root / "run/log/journal");
    SourceLines source{.isThere =
                           onDisk != FolderState::WithoutFiles || inMemory != FolderState::WithoutFiles,
                       .name = kJournalName};
    const Journal journal = source.isThere ? openJournal(query.root) : nullptr;
    if (!journal) {
        return source;
    }
    // In a journal on disk each user has a file of their own, from their first line on.
    source.isReadable = onDisk == FolderState::WithFiles || ::sd_journal_has_runtime_files(journal.get()) > 0;
    matchLogins(journal.get(), query.userID);
    EnoughLines enough(query);
    ::sd_journal_seek_tail(journal.get());
    while (::sd_journal_previous(journal.get()) > 0) {
        LogLine line = currentLine(journal.get());
        if (!enough.wants(line)) {
            break;
        }
        source.lines.push_back(std::move(line));
    }
    std::ranges::reverse(source.lines);
    return source;
}

} // namespace welcomer::tool
