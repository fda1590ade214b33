#include "tools/launch-agents/AgentJournal.h"

#include "tools/shared/Journal.h"

#include <cstdint>
#include <systemd/sd-id128.h>
#include <systemd/sd-journal.h>
#include <unistd.h>
#include <utility>

namespace welcomer::launch {

namespace {

// A journal that shows what one user's process and program have sent since its start, or none.
journal::Journal openJournal(const AgentRun& run, const std::string& program) {
    sd_id128_t boot = {};
    sd_journal* opened = nullptr;
    if (sd_id128_get_boot(&boot) < 0 || sd_journal_open(&opened, SD_JOURNAL_LOCAL_ONLY) < 0) {
        return nullptr;
    }
    journal::Journal opening(opened);
    char bootText[SD_ID128_STRING_MAX];
    if (!journal::match(opened, "_PID", std::to_string(run.process)) ||
        !journal::match(opened, "SYSLOG_IDENTIFIER", program) ||
        !journal::match(opened, "_UID", std::to_string(::geteuid())) ||
        !journal::match(opened, "_BOOT_ID", sd_id128_to_string(boot, static_cast<char*>(bootText)))) {
        return nullptr;
    }
    const auto start = static_cast<std::uint64_t>(run.start.count());
    return sd_journal_seek_monotonic_usec(opened, boot, start) < 0 ? nullptr : std::move(opening);
}

} // namespace

std::vector<std::string> readAgentLines(const AgentRun& run, const std::string& program,
                                        const std::string& last, std::chrono::microseconds patience) {
    using std::chrono::steady_clock;
    std::vector<std::string> lines;
    const journal::Journal entries = openJournal(run, program);
    const auto end = steady_clock::now() + patience;
    while (entries) {
        while (sd_journal_next(entries.get()) > 0) {
            if (journal::field(entries.get(), "_SYSTEMD_INVOCATION_ID").value_or(run.invocation) ==
                run.invocation) {
                lines.push_back(journal::field(entries.get(), "MESSAGE").value_or(""));
            }
        }
        const auto left =
            std::chrono::duration_cast<std::chrono::microseconds>(end - steady_clock::now()).count();
        if ((!lines.empty() && lines.back() == last) || left <= 0 ||
            sd_journal_wait(entries.get(), static_cast<std::uint64_t>(left)) < 0) {
            break;
        }
    }
    return lines;
}

} // namespace welcomer::launch
