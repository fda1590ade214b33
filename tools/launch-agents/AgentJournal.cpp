#include "tools/launch-agents/AgentJournal.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <systemd/sd-id128.h>
#include <systemd/sd-journal.h>
#include <unistd.h>
#include <utility>

namespace welcomer::launch {

namespace {

struct CloseJournal {
    void operator()(sd_journal* journal) const { sd_journal_close(journal); }
};
using Journal = std::unique_ptr<sd_journal, CloseJournal>;

// A journal that shows what one user's process and program have sent since its start, or none.
Journal openJournal(const AgentRun& run, const std::string& program) {
    sd_id128_t boot = {};
    sd_journal* opened = nullptr;
    if (sd_id128_get_boot(&boot) < 0 || sd_journal_open(&opened, SD_JOURNAL_LOCAL_ONLY) < 0) {
        return nullptr;
    }
    Journal journal(opened);
    char bootText[SD_ID128_STRING_MAX];
    for (const std::string& match :
         {"_PID=" + std::to_string(run.process), "SYSLOG_IDENTIFIER=" + program,
          "_UID=" + std::to_string(::geteuid()),
          std::string("_BOOT_ID=") + sd_id128_to_string(boot, static_cast<char*>(bootText))}) {
        if (sd_journal_add_match(opened, match.data(), match.size()) < 0) {
            return nullptr;
        }
    }
    const auto start = static_cast<std::uint64_t>(run.start.count());
    return sd_journal_seek_monotonic_usec(opened, boot, start) < 0 ? nullptr : std::move(journal);
}

// A field of the entry that the journal is at; none where it has none.
std::optional<std::string> field(sd_journal* journal, const std::string& name) {
    const void* data = nullptr;
    std::size_t size = 0;
    if (sd_journal_get_data(journal, name.c_str(), &data, &size) < 0 || size < name.size() + 1) {
        return std::nullopt;
    }
    return std::string(static_cast<const char*>(data), size).substr(name.size() + 1);
}

} // namespace

std::vector<std::string> readAgentLines(const AgentRun& run, const std::string& program,
                                        const std::string& last, std::chrono::microseconds patience) {
    using std::chrono::steady_clock;
    std::vector<std::string> lines;
    const Journal journal = openJournal(run, program);
    const auto end = steady_clock::now() + patience;
    while (journal) {
        while (sd_journal_next(journal.get()) > 0) {
            if (field(journal.get(), "_SYSTEMD_INVOCATION_ID").value_or(run.invocation) == run.invocation) {
                lines.push_back(field(journal.get(), "MESSAGE").value_or(""));
            }
        }
        const auto left =
            std::chrono::duration_cast<std::chrono::microseconds>(end - steady_clock::now()).count();
        if ((!lines.empty() && lines.back() == last) || left <= 0 ||
            sd_journal_wait(journal.get(), static_cast<std::uint64_t>(left)) < 0) {
            break;
        }
    }
    return lines;
}

} // namespace welcomer::launch
